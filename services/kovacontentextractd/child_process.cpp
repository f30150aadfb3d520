#include "services/kovacontentextractd/child_process.h"

#include <poll.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "common/unique_fd.h"

namespace ferrox::extract {

namespace {

using SteadyClock = std::chrono::steady_clock;
using std::chrono::milliseconds;

/// For a process that was killed to be gone. One that a file system holds in the middle of a read cannot even be
/// killed: it is left alone then.
constexpr milliseconds kEndMax(2000);
constexpr int kPollMs = 1;

}  // namespace

void ChildProcess::End() {
  if (pid_ <= 0) return;
  (void)kill(pid_, SIGKILL);
  (void)Wait(kEndMax);
  pid_ = -1;
}

std::optional<int> ChildProcess::Wait(milliseconds longest) {
  if (pid_ <= 0) return std::nullopt;
  const UniqueFd process(static_cast<int>(syscall(SYS_pidfd_open, pid_, 0)));
  pollfd state = {process.Get(), POLLIN, 0};
  const auto end = SteadyClock::now() + longest;
  for (;;) {
    int status = 0;
    const pid_t ended = waitpid(pid_, &status, WNOHANG);
    if (ended == pid_ || (ended < 0 && errno != EINTR)) {
      pid_ = -1;
      return ended < 0 ? std::nullopt : std::optional(status);
    }
    const auto left = std::chrono::ceil<milliseconds>(end - SteadyClock::now()).count();
    if (left < 0) return std::nullopt;
    (void)poll(&state, 1, process.Valid() ? static_cast<int>(left) : kPollMs);
  }
}

}  // namespace ferrox::extract
