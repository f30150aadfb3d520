#pragma once

#include <memory>
#include <string>

#include "common/export.h"

namespace ferrox {

/// Holds an flock on a file while it lives; the file is made when missing and never removed. Two holders exclude each
/// other also within one process, so a thread must not take the exclusive lock on a path twice. The kernel gives the
/// lock back when the process ends, however it ends. Programs that are run meanwhile do not inherit it; a child that is
/// only forked does.
class FERROX_EXPORT LockFile {
 public:
  /// Takes the lock, exclusive or shared. It counts as had only when the locked file is still the one at `path`, so
  /// that a file that was renamed away in between is not mistaken for it. Links are not followed; only a regular file
  /// serves. Blocks while the lock is held elsewhere: 64 attempts, 0 to 0.9 s apart, at most about 58 s.
  /// Then who holds it is logged.
  /// @throws Error kLockFailed when the file cannot be opened, is no regular file, or stays locked.
  LockFile(const std::string& path, bool exclusive);
  /// The lock if it can be had at once; else null, with errno set: EWOULDBLOCK while it is held elsewhere. Logs
  /// nothing.
  static std::unique_ptr<LockFile> Try(const std::string& path, bool exclusive);
  LockFile(const LockFile&) = delete;
  LockFile& operator=(const LockFile&) = delete;
  ~LockFile();

  /// The locked file, open for reading. Owned here; closing it elsewhere would give the lock back early.
  int Descriptor() const { return fd_; }

 private:
  LockFile() = default;

  int fd_ = -1;  ///< the open file that has the lock; -1 only while one is being made
  std::string path_;
};

}  // namespace ferrox
