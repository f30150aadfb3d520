#include "services/fileindexd/file_watch.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cstdint>

#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::indexd {

namespace {

using SteadyClock = std::chrono::steady_clock;

/// Waits until one of two descriptors (-1: none) is readable; false at the end of the time.
bool WaitReadable(int first, int second, SteadyClock::time_point end) {
  const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(end - SteadyClock::now()).count();
  pollfd polled[] = {{first, POLLIN, 0}, {second, POLLIN, 0}};
  return poll(polled, 2, static_cast<int>(std::clamp<int64_t>(left, 0, 3600 * 1000))) > 0;
}

bool DrainWake(int fd) {
  uint64_t count = 0;
  return read(fd, &count, sizeof(count)) == sizeof(count);
}

}  // namespace

FileWatch::FileWatch(const std::vector<std::string>& paths)
    : inotify_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)), wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  FERROX_FAIL_IF(!wake_.Valid(), Error::kInternal, "eventfd failed, reason=" + ErrnoText());
  for (const std::string& path : paths) Watch(path);
}

void FileWatch::Watch(const std::string& path) {
  constexpr uint32_t kChanges = IN_CREATE | IN_MODIFY | IN_MOVED_TO | IN_ONLYDIR;
  const int watch = inotify_add_watch(inotify_.Get(), Dirname(path).c_str(), kChanges);
  if (watch >= 0) {
    watched_.emplace(watch, Basename(path));
    return;
  }
  sees_changes_ = false;
  Log(LOG_WARNING, "%s cannot be watched (%m), it is looked at now and then", path.c_str());
}

bool FileWatch::Wait(std::chrono::milliseconds limit) {
  const auto end = SteadyClock::now() + limit;
  while (WaitReadable(inotify_.Get(), wake_.Get(), end)) {
    const bool woken = DrainWake(wake_.Get());
    if (DrainEvents() || woken) return true;
  }
  return false;
}

void FileWatch::WaitForWake(std::chrono::milliseconds limit) {
  const auto end = SteadyClock::now() + limit;
  if (WaitReadable(-1, wake_.Get(), end)) (void)DrainWake(wake_.Get());
}

void FileWatch::Wake() {
  const uint64_t one = 1;
  (void)!write(wake_.Get(), &one, sizeof(one));  // fails only when a wake is pending many times over
}

/// Whether one of the events is of a file that is watched. After an overflow, any could have been.
bool FileWatch::DrainEvents() {
  if (!inotify_.Valid()) return false;
  alignas(inotify_event) char buffer[16 * 1024];
  bool ours = false;
  ssize_t size = 0;
  while ((size = read(inotify_.Get(), buffer, sizeof(buffer))) > 0) {
    for (ssize_t at = 0; at < size;) {
      const auto* event = reinterpret_cast<const inotify_event*>(buffer + at);
      ours = ours || (event->mask & IN_Q_OVERFLOW) != 0 ||
             (event->len > 0 && watched_.count({event->wd, event->name}) != 0);
      at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
    }
  }
  return ours;
}

}  // namespace ferrox::indexd
