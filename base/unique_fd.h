#pragma once

#include <unistd.h>

#include <cerrno>
#include <utility>

namespace base {

/// Owns a descriptor and closes it at the end of its life. Movable: what it is moved from owns none. Not for several
/// threads at once. A failed open can be handed to it as it is:
///   const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
///   if (!file.Valid()) return false;  // errno is open's
class UniqueFd {
 public:
  UniqueFd() = default;
  /// Owns `fd` from now on; none when it is below 0.
  explicit UniqueFd(int fd) : fd_(fd) {}
  UniqueFd(UniqueFd&& other) noexcept : fd_(other.Release()) {}
  UniqueFd& operator=(UniqueFd&& other) noexcept {
    Reset(other.Release());
    return *this;
  }
  /// Closes without a look at the result: a writer that must know calls Close before. errno stays as it is, that of the
  /// call for whose failure the scope is left.
  ~UniqueFd() { Reset(); }

  /// The descriptor, still owned here; below 0 without one.
  int Get() const { return fd_; }
  bool Valid() const { return fd_ >= 0; }
  /// Gives the descriptor away: the caller closes it.
  int Release() { return std::exchange(fd_, -1); }
  /// Closes now; false, with errno, when the kernel reports that written data could not be stored. Valid() before.
  /// Owns none afterwards in either case: the kernel has given up the descriptor even when it reports a failure.
  bool Close() { return close(std::exchange(fd_, -1)) == 0; }
  /// Closes what it owns, without a change of errno, and owns `fd` from now on, which must not be the descriptor that
  /// it owns already.
  void Reset(int fd = -1) {
    if (fd_ >= 0) {
      const int saved_errno = errno;
      (void)close(fd_);
      errno = saved_errno;
    }
    fd_ = fd;
  }

 private:
  int fd_ = -1;
};

}  // namespace base
