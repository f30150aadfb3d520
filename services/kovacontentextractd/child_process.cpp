#include "services/kovacontentextractd/child_process.h"

#include <poll.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <mutex>
#include <utility>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::extract {

namespace {

using SteadyClock = std::chrono::steady_clock;
using std::chrono::milliseconds;

/// For a process that was killed to be gone. One that used much memory takes seconds where the machine swaps; who takes
/// it for held by a file system lets its file wait instead of blaming it.
constexpr milliseconds kEndMax(10000);
constexpr int kPollMs = 1;

struct HeldProcesses {
  std::mutex mutex;
  std::vector<pid_t> pids;
};
HeldProcesses g_held;

}  // namespace

bool ChildProcess::End() {
  if (pid_ <= 0) return true;
  (void)kill(pid_, SIGKILL);
  (void)Wait(kEndMax);
  const pid_t held = std::exchange(pid_, -1);
  if (held <= 0) return true;
  const std::lock_guard guard(g_held.mutex);
  g_held.pids.push_back(held);
  return false;
}

size_t ChildProcess::Held() {
  const std::lock_guard guard(g_held.mutex);
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
