#pragma once

#include <string>
#include <vector>

#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// Takes documents along when what they describe is renamed, to spare reading the files again. Only that: a rename is a
/// hint, and both places are compared with the disk afterwards. Later renames have carried the earlier ones along in
/// the queue, which then no longer tells what happened (two folders that were swapped, for example), and an earlier
/// pass may have seen the disk as it is now.
class DocumentMover {
 public:
  /// All outlive it; `root` is the share's folder.
  DocumentMover(const std::string& root, ShareIndex& index, const ShareFolders& folders, PathRules& rules,
                DocumentWriter& writer, const Interruption& interruption)
      : root_(root), index_(index), folders_(folders), rules_(rules), writer_(writer), interruption_(interruption) {}

  /// The documents at and below `old_path` that go to `path`.
  struct Step {
    std::string path;
    std::string old_path;
  };
  /// What follows the rename of `old_path`, which lay outside the present root when the share itself was renamed or
  /// moved. Belongs to one thread.
  std::vector<Step> StepsOf(const std::string& path, const std::string& old_path);
  /// The folder that was at `top`, or below it, and is the share's folder now, as far as documents there tell; or "".
  std::string RootBeforeMove(const std::string& top);
  /// Whether the document at `path` is of the file or folder that `status` is of, wherever that is by now.
  bool DescribesFile(const std::string& path, const struct stat& status);
  /// From any thread. @throws Interrupted; Error.
  void Move(const Step& step);

 private:
  std::vector<std::string> IndexedTopsOf(const std::string& path);
  bool HoldsDocumentsOf(const std::string& old_path, const std::string& path);

  const std::string& root_;
  ShareIndex& index_;
  const ShareFolders& folders_;
  PathRules& rules_;
  DocumentWriter& writer_;
  const Interruption& interruption_;
};

}  // namespace ferrox::indexd
