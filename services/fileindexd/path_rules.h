#pragma once

#include <sys/stat.h>

#include <map>
#include <string>

namespace ferrox::indexd {

/// Decides which paths of one share are indexed, asking the costly questions (file system, share, recycle bin, mount
/// point, canonical path) once per folder or device instead of once per file. Made per pass; belongs to one thread.
class PathRules {
 public:
  /// `root` is the share's folder. @throws Error kNoSuchShare; kInternal.
  PathRules(const std::string& share, const std::string& root);

  /// Why nothing of the share can be indexed now, "" when it can.
  std::string ShareProblem() const;
  /// Whether the path, at or below the root, may be indexed by its name and place. Nothing need exist there.
  bool CanBeIndexed(const std::string& path);
  /// Whether a name is never indexed, nor anything below it.
  static bool SkipName(const std::string& name);
  /// Whether a walk that is in a folder on `parent_device` may enter the folder `path`.
  bool MayEnter(const std::string& path, const struct stat& status, dev_t parent_device) const;

 private:
  bool FolderCanBeIndexed(const std::string& folder);

  std::string share_;
  std::string root_;
  std::map<std::string, bool> folders_;
};

}  // namespace ferrox::indexd
