#include "services/kovanotifyd/registry.h"

#include <sys/inotify.h>
#include <syslog.h>
#include <unistd.h>

#include "base/files.h"
#include "common/log.h"

namespace ferrox::notifyd {

std::map<std::string, std::vector<QueueWatch>> Registry::Queues() const {
  std::map<std::string, std::vector<QueueWatch>> queues;
  for (const Registration& registration : list) {
    std::vector<QueueWatch>& watches = queues[registration.queue];
    watches.insert(watches.end(), registration.watches.begin(), registration.watches.end());
  }
  return queues;
}

RegistryWatch::RegistryWatch(std::string folder)
    : folder_(std::move(folder)), inotify_(inotify_init1(IN_CLOEXEC | IN_NONBLOCK)) {
  if (!inotify_.Valid()) Log(LOG_WARNING, "%s cannot be watched (%m), it is looked at now and then", folder_.c_str());
  Rearm();
}

/// The watch is set again each time: a folder that was removed takes its watch with it.
void RegistryWatch::Rearm() {
  if (!inotify_.Valid()) return;
  char events[4096];
  while (read(inotify_.Get(), events, sizeof(events)) > 0) {
  }
  constexpr uint32_t kChanges =
      IN_MOVED_TO | IN_MOVED_FROM | IN_DELETE | IN_CLOSE_WRITE | IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR;
  if (inotify_add_watch(inotify_.Get(), folder_.c_str(), kChanges) >= 0) return;
  (void)base::MakeFolders(folder_);
  (void)inotify_add_watch(inotify_.Get(), folder_.c_str(), kChanges);
}

void RegistryReader::Read() {
  watch_.Rearm();
  current_ = read_();
  const std::set<std::string> problems(current_.problems.begin(), current_.problems.end());
  for (const std::string& problem : problems) {
    if (logged_problems_.count(problem) == 0) Log(LOG_ERR, "%s", problem.c_str());
  }
  logged_problems_ = problems;
}

}  // namespace ferrox::notifyd
