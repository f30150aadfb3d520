#pragma once

#include <map>
#include <set>
#include <string>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// Notices when a folder itself is removed, moved or unmounted, whichever way its content is watched: a mark on a file
/// system dies with the unmount without a word, and the next mount may look the same in every number.
class RootGuard {
 public:
  RootGuard();

  /// Readable when Read has something to tell; -1 where the kernel grants nothing.
  int Fd() const { return inotify_.Get(); }
  void Add(const std::string& path);
  void Remove(const std::string& path);
  /// The folders to which something happened. They are not guarded any more.
  std::set<std::string> Read();

 private:
  base::UniqueFd inotify_;
  std::map<int, std::set<std::string>> paths_;  ///< by watch: a folder that is mounted twice has one
};

}  // namespace ferrox::notifyd
