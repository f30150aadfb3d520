#include "common/lock_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdlib>

#include <kova/lock_holder.h>

#include "base/unique_fd.h"
#include "common/clock.h"
#include "common/log.h"

namespace ferrox {

namespace {

constexpr int kAttempts = 64;
// O_NONBLOCK: a FIFO at the path must not hold the opener.
constexpr int kOpenFlags = O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;

/// Opens the file, made only when missing: in a sticky folder the kernel refuses O_CREAT on another user's file.
int OpenLockFile(const std::string& path) {
  const int fd = open(path.c_str(), kOpenFlags);
  return fd >= 0 || errno != ENOENT ? fd : open(path.c_str(), kOpenFlags | O_CREAT, 0644);
}

bool IsRegular(int fd) {
  struct stat opened = {};
  return fstat(fd, &opened) == 0 && S_ISREG(opened.st_mode);
}

void WaitForNextAttempt() { Clock::Get().SleepFor(std::chrono::milliseconds(100 * (rand() % 10))); }

/// Names in the log the process that kept the lock for longer than all attempts took.
void LogHolder(const std::string& path) {
  const int saved_errno = errno;
  const std::string holder = kova::LockHolderText(path);
  if (!holder.empty()) Log(LOG_WARNING, "%s: %s", path.c_str(), holder.c_str());
  errno = saved_errno;
}

}  // namespace

LockFile::LockFile(const std::string& path, bool exclusive) : path_(path) {
  for (int attempt = 0; attempt < kAttempts; ++attempt) {
    fd_ = OpenLockFile(path_);
    FERROX_FAIL_IF_AS(0 > fd_, "0 > (fd_ = open(path_.c_str(), O_RDONLY | O_CREAT, 0644))", Error::kLockFailed,
                      "open failed, path=" + path_ + ", reason=" + ErrnoText());
    if (!IsRegular(fd_)) {
      (void)close(fd_);
      errno = 0;
      FERROX_FAIL_IF_AS(true, "!S_ISREG(opened.st_mode)", Error::kLockFailed,
                        "open failed, path=" + path_ + ", reason=not a regular file");
    }
    const bool locked = flock(fd_, (exclusive ? LOCK_EX : LOCK_SH) | LOCK_NB) == 0;
    if (locked && kova::IsStillAt(fd_, path_)) return;
    const int lock_errno = errno;
    (void)close(fd_);
    fd_ = -1;
    if (!locked && lock_errno != EINTR && lock_errno != EAGAIN) {
      errno = lock_errno;
      throw Error(Error::kLockFailed, ErrnoText());
    }
    // A renamed file frees its path at once; only a held lock is worth waiting for.
    if (!locked) WaitForNextAttempt();
  }
  LogHolder(path_);
  FERROX_FAIL_IF_AS(true, "kAttempts <= attempt", Error::kLockFailed, "Exceed max retry, path=" + path_,
                    Subject{Subject::kLock, path_});
}

std::unique_ptr<LockFile> LockFile::Try(const std::string& path, bool exclusive) {
  std::unique_ptr<LockFile> lock(new LockFile);
  for (int attempt = 0; attempt < kAttempts; ++attempt) {
    base::UniqueFd file(OpenLockFile(path));
    if (!file.Valid()) return nullptr;
    if (!IsRegular(file.Get())) {
      errno = EINVAL;
      return nullptr;
    }
    if (flock(file.Get(), (exclusive ? LOCK_EX : LOCK_SH) | LOCK_NB) != 0) return nullptr;
    if (!kova::IsStillAt(file.Get(), path)) continue;  // a renamed file frees its path at once
    lock->fd_ = file.Release();
    lock->path_ = path;
    return lock;
  }
  errno = EWOULDBLOCK;
  return nullptr;
}

LockFile::~LockFile() {
  if (fd_ < 0) return;
  (void)flock(fd_, LOCK_UN);
  (void)close(fd_);
}

}  // namespace ferrox
