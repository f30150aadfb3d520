#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstddef>
#include <optional>

namespace ferrox::extract {

/// A child of this process, ended at the latest with this object. Waits go by a descriptor of the process (pidfd_open),
/// so they end as soon as the child does; kernels before 5.3 are asked every millisecond. For one thread at a time,
/// apart from Held.
class ChildProcess {
 public:
  explicit ChildProcess(pid_t pid = -1) : pid_(pid) {}
  ChildProcess(const ChildProcess&) = delete;
  ChildProcess& operator=(const ChildProcess&) = delete;
  ~ChildProcess() { (void)End(); }

  /// Takes over a child; only when there was none.
  void Take(pid_t pid) { pid_ = pid; }
  /// Ends it at once, and waits until it is gone. @return false when it cannot be killed, because a file system holds
  /// it in the middle of a read; it is left alone then.
  bool End();
  /// How many were left alone and have not ended since.
  static size_t Held();
  /// The status with which it ended, as soon as it has, at most `longest` from now; nothing when it has not.
  std::optional<int> Wait(std::chrono::milliseconds longest);

 private:
  pid_t pid_;
};

}  // namespace ferrox::extract
