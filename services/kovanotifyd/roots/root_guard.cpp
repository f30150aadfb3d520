#include "services/kovanotifyd/roots/root_guard.h"

#include <sys/inotify.h>
#include <unistd.h>

namespace ferrox::notifyd {

RootGuard::RootGuard() : inotify_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)) {}

void RootGuard::Add(const std::string& path) {
  const int watch =
      inotify_add_watch(inotify_.Get(), path.c_str(), IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR | IN_DONT_FOLLOW);
  if (watch >= 0) paths_[watch].insert(path);
}

void RootGuard::Remove(const std::string& path) {
  for (auto it = paths_.begin(); it != paths_.end();) {
    const auto current = it++;
    if (current->second.erase(path) == 0 || !current->second.empty()) continue;
    (void)inotify_rm_watch(inotify_.Get(), current->first);
    paths_.erase(current);
  }
}

std::set<std::string> RootGuard::Read() {
  std::set<std::string> disturbed;
  alignas(inotify_event) char buffer[4096];
  ssize_t size = 0;
  while ((size = read(inotify_.Get(), buffer, sizeof(buffer))) > 0) {
    for (ssize_t at = 0; at < size;) {
      const auto* event = reinterpret_cast<const inotify_event*>(buffer + at);
      at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
      const auto found = paths_.find(event->wd);
      if (found == paths_.end()) continue;
      disturbed.merge(found->second);
      paths_.erase(found);
      (void)inotify_rm_watch(inotify_.Get(), event->wd);
    }
  }
  return disturbed;
}

}  // namespace ferrox::notifyd
