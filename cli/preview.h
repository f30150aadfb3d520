#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include <json/value.h>

#include "cli/command.h"
#include "cli/kinds.h"
#include "services/support/exclusions.h"

/// What the indexing of a folder would come to, for --dry-run: a walk by the rules of the index daemon that changes and
/// opens nothing but folders.
namespace ferrox::cli {

/// How many files, and their size.
struct FileTotal {
  uint64_t files = 0;
  uint64_t bytes = 0;
  void Add(uint64_t size) {
    ++files;
    bytes += size;
  }
};

struct Preview {
  FileTotal all;
  uint64_t folders = 0;
  FileTotal content;                       ///< of these, those whose content is read
  std::map<std::string, FileTotal> kinds;  ///< by kKinds and "other"
  uint64_t links = 0;                      ///< which are never indexed
  FileTotal excluded;                      ///< by patterns; not in `all`
  /// Folders that are left out with all in them, and why; at most kLeftOutMax, further ones are counted.
  std::vector<std::pair<std::string, std::string>> left_out;
  uint64_t more_left_out = 0;

  static constexpr size_t kLeftOutMax = 20;
  void LeaveOut(const std::string& path, const std::string& reason);
};

/// What to walk through.
struct PreviewRequest {
  std::string name;    ///< what the folder is called
  std::string root;    ///< its share's folder
  std::string folder;  ///< full path
  Kinds kinds;         ///< of files whose content is read
  services::ExclusionRules rules;
  std::map<std::string, std::string> others;  ///< folders below it that are none of its concern, each with the reason
};

/// `progress` is called now and then with the number of files so far.
Preview WalkForPreview(const PreviewRequest& request, const std::function<void(uint64_t files)>& progress);

/// A preview for people, or as one JSON object in a line. `name` is what the folder is called.
void PrintPreview(const std::string& name, const Preview& preview, bool json);

/// Whether --dry-run is asked for. @throws UsageError for --json without it.
bool IsDryRun(const Arguments& arguments);

/// WalkForPreview and PrintPreview with a progress line on standard error: for 'folder add' and 'share add'.
void ShowPreview(PreviewRequest request, bool json);

}  // namespace ferrox::cli
