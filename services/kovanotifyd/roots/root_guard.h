#pragma once

#include <map>
#include <set>
#include <string>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// Notices when a root's own folder is removed, moved or unmounted, in whichever way its content is watched. The
/// watchers alone would miss an unmount: the mark on a file system is gone with it without a record, and the next mount
/// may look the same in every number. One watch of inotify for each root.
class RootGuard {
 public:
  RootGuard();

  /// Readable when Read has something to report; -1 where inotify is not available, and nothing is noticed.
  int Fd() const { return inotify_.Get(); }
  void Add(const std::string& path);
  void Remove(const std::string& path);
  /// The folders to which something happened since the last call. They are no longer guarded.
  std::set<std::string> Read();

 private:
  base::UniqueFd inotify_;
  std::map<int, std::set<std::string>> paths_;  ///< by watch descriptor; a folder that is mounted twice has one
};

}  // namespace ferrox::notifyd
