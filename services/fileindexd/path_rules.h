#pragma once

#include <sys/stat.h>

#include <map>
#include <string>

#include "services/fileindexd/share_folders.h"

namespace ferrox::indexd {

/// Why nothing of the share, whose folder is `root` and there, can be indexed now, "" when it can. @throws Error
/// kNoSuchShare; kInternal.
std::string ShareProblem(const std::string& share, const std::string& root);

/// Decides which paths of one share are indexed: those under its indexed folders, unless the rules for names and
/// places, or patterns, leave them out. Asks the costly questions (file system, share, recycle bin, mount point,
/// canonical path) once per folder or device instead of once per file. Made per pass; belongs to one thread. A call
/// throws Error kInternal or kNoSuchShare while the platform does not know the path's share; the pass is then to be
/// tried again.
class PathRules {
 public:
  using Place = ShareFolders::Place;

  /// `root` is the share's folder; `folders` and `exclusions` outlive the rules.
  PathRules(const std::string& share, const std::string& root, const ShareFolders& folders,
            services::Exclusions& exclusions);

  /// What the path, at or below the root, is for the index by its name and place. Nothing need exist there.
  Place PlaceOf(const std::string& path);
  /// The same, when it is known whether a folder is there.
  Place PlaceOf(const std::string& path, bool is_folder);
  bool CanBeIndexed(const std::string& path) { return PlaceOf(path) == Place::kIndexed; }
  /// The same by folders and patterns alone: names and places are not asked about.
  Place PlaceByPatterns(const std::string& path, bool is_folder);
  /// Whether a name is never indexed, nor anything below it.
  static bool SkipName(const std::string& name);
  /// Whether patterns leave the path out, whatever is or was there: it has no documents, and needs no look. Those of
  /// before the patterns were set go by the comparison that these bring about.
  bool IsExcluded(const std::string& path);
  /// Whether a walk that is in a folder on `parent_device` may enter the folder `path`.
  bool MayEnter(const std::string& path, const struct stat& status, dev_t parent_device) const;

 private:
  bool IsLeftOut(const std::string& path, bool is_folder);
  bool FolderIsLeftOut(const std::string& folder);

  std::string share_;
  std::string root_;
  const ShareFolders& folders_;
  services::Exclusions& exclusions_;
  std::map<std::string, bool> left_out_;
};

}  // namespace ferrox::indexd
