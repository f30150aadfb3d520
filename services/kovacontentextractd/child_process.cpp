#include "services/kovacontentextractd/child_process.h"

#include <poll.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <utility>
#include <vector>

#include "base/mutex.h"
#include "base/unique_fd.h"

namespace ferrox::extract {

namespace {

using SteadyClock = std::chrono::steady_clock;
using std::chrono::milliseconds;

/// How long a killed process may take to be gone before it counts as held by a file system. One that used much memory
/// takes seconds on a machine that swaps; taken for held, its file would wait instead of being blamed.
constexpr milliseconds kEndMax(10000);
/// Between two looks at a child where the kernel has no pidfd_open (before Linux 5.3).
constexpr int kPollMs = 1;

/// Killed children that a file system holds in the middle of a call. They stay ours to reap: a pid that is never waited
/// for stays taken.
struct HeldProcesses {
  base::Mutex mutex;
  std::vector<pid_t> pids BASE_GUARDED_BY(mutex);
};
HeldProcesses g_held;

}  // namespace

bool ChildProcess::End() {
  if (pid_ <= 0) return true;
  (void)kill(pid_, SIGKILL);
  (void)Wait(kEndMax);
  const pid_t held = std::exchange(pid_, -1);
  if (held <= 0) return true;
  const base::MutexLock guard(g_held.mutex);
  g_held.pids.push_back(held);
  return false;
}

size_t ChildProcess::Held() {
  const base::MutexLock guard(g_held.mutex);
  std::erase_if(g_held.pids, [](pid_t pid) { return waitpid(pid, nullptr, WNOHANG) != 0; });
  return g_held.pids.size();
}

std::optional<int> ChildProcess::Wait(milliseconds longest) {
  if (pid_ <= 0) return std::nullopt;
  const base::UniqueFd process(static_cast<int>(syscall(SYS_pidfd_open, pid_, 0)));
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
