#pragma once

#include <sys/types.h>

#include <string>

namespace kova::host {

/// Starts a program that outlives this one: a session of its own, no terminal, standard input empty, standard output
/// and error appended to the file at `log_path`, every other descriptor closed, usual signals, working directory "/".
/// @return its process id, or below 0 with errno when it cannot be started.
pid_t StartDetached(const std::string& program, const std::string& log_path);

/// A process by a handle that cannot come to mean another one.
class ProcessHandle {
 public:
  explicit ProcessHandle(pid_t pid);
  ProcessHandle(const ProcessHandle&) = delete;
  ProcessHandle& operator=(const ProcessHandle&) = delete;
  ~ProcessHandle();

  /// Whether it has ended (as far as can be told), waiting at most `timeout_ms` for that.
  bool WaitForEnd(int timeout_ms) const;
  bool Signal(int number) const;

 private:
  pid_t pid_;
  int fd_;
};

}  // namespace kova::host
