#pragma once

#include <string>

#include "base/unique_fd.h"

namespace ferrox::services {

/// To be made before the first thread: signals are blocked for those that start later.
/// What every daemon does at its start, in this order: refuses an unusable instance root, makes the instance's runtime
/// folders, opens the log (standard error too in an instance), turns SIGTERM and SIGINT into StopFd, ignores SIGHUP and
/// SIGPIPE, takes the pid file, whose lock lasts as long as the process, and sees to the instance's lock files.
class Daemon {
 public:
  /// @throws Error kInternal with a sentence when the root is unusable or another process already has the pid file.
  explicit Daemon(const std::string& name);
  Daemon(const Daemon&) = delete;
  Daemon& operator=(const Daemon&) = delete;
  /// Empties the pid file, unless it is an exception that ends the daemon: a pid file that is not empty and not locked
  /// is that of a daemon that died.
  ~Daemon();

  /// Becomes readable when the daemon was asked to stop (SIGTERM, SIGINT).
  int StopFd() const { return stop_fd_.Get(); }
  /// Tells the service manager that the daemon answers from now on, by the socket that NOTIFY_SOCKET names; does
  /// nothing without one.
  void NotifyReady();
  /// Whether its pid file is still where it belongs: the folder of a private instance may have been removed.
  bool HasPidFile() const;

 private:
  std::string name_;
  base::UniqueFd pid_file_;
  base::UniqueFd stop_fd_;
};

/// Keeps others from the lock files that all processes of the instance share (kova/lock_holder.h).
void GuardLockFiles();

}  // namespace ferrox::services
