#pragma once

#include <unistd.h>

#include <utility>

namespace base {

/// Owns a descriptor and closes it at the end of its life. Movable: what it is moved from owns none.
class UniqueFd {
 public:
  UniqueFd() = default;
  explicit UniqueFd(int fd) : fd_(fd) {}
  UniqueFd(UniqueFd&& other) noexcept : fd_(other.Release()) {}
  UniqueFd& operator=(UniqueFd&& other) noexcept {
    Reset(other.Release());
    return *this;
  }
  ~UniqueFd() { Reset(); }

  int Get() const { return fd_; }
  bool Valid() const { return fd_ >= 0; }
  /// Gives the descriptor away: the caller closes it.
  int Release() { return std::exchange(fd_, -1); }
  /// Closes now; false, with errno, when the kernel reports that written data could not be stored. Valid() before.
  bool Close() { return close(std::exchange(fd_, -1)) == 0; }
  /// Closes what it owns and owns `fd` from now on.
  void Reset(int fd = -1) {
    if (fd_ >= 0) (void)close(fd_);
    fd_ = fd;
  }

 private:
  int fd_ = -1;
};

}  // namespace base
