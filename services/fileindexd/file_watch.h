#pragma once

#include <chrono>
#include <string>

#include "common/unique_fd.h"

namespace ferrox::indexd {

/// Waits for a queue file to change or for a call from another thread.
class QueueWatch {
 public:
  /// Without inotify (its instances are limited) only time and Wake end a wait.
  explicit QueueWatch(const std::string& queue_path);

  /// Returns after a change of the queue, after Wake, or after `limit`; a change or a Wake since the last wait counts.
  void Wait(std::chrono::milliseconds limit);
  /// The same for Wake alone.
  void WaitForWake(std::chrono::milliseconds limit);
  void Wake();
  bool SeesChanges() const { return inotify_.Valid(); }

 private:
  bool DrainEvents();

  std::string queue_name_;
  UniqueFd inotify_;
  UniqueFd wake_;
};

}  // namespace ferrox::indexd
