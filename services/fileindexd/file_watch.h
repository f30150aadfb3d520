#pragma once

#include <chrono>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::indexd {

/// Lets a thread wait until one of some files is made, written or replaced (inotify on their folders), or another
/// thread wakes it. One thread waits; Wake is for any.
class FileWatch {
 public:
  /// Without inotify (its instances are limited), or where a file's folder is missing, only time and Wake end a wait.
  /// @throws Error kInternal.
  explicit FileWatch(const std::vector<std::string>& paths);

  /// Returns after a change of one of the files, after Wake, or after `limit`; a change or a Wake since the last wait
  /// counts. @return whether it did not take the whole time.
  bool Wait(std::chrono::milliseconds limit);
  /// The same for Wake alone.
  void WaitForWake(std::chrono::milliseconds limit);
  void Wake();
  /// The longest wait after which the files should be read again though no change of them was reported: 30 s, and 2 s
  /// where none is.
  std::chrono::seconds LongestWait() const { return std::chrono::seconds(sees_changes_ ? 30 : 2); }

 private:
  void Watch(const std::string& path);
  bool DrainEvents();

  std::set<std::pair<int, std::string>> watched_;  ///< the watch of a folder, and a name in it
  bool sees_changes_ = true;                       ///< of all files
  base::UniqueFd inotify_;
  base::UniqueFd wake_;
};

}  // namespace ferrox::indexd
