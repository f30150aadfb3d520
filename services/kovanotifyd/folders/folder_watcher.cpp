#include "services/kovanotifyd/folders/folder_watcher.h"

#include <fcntl.h>
#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "base/unique_fd.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::notifyd {

FolderWatcher::FolderWatcher(std::unique_ptr<FolderPort> port, const Options& options)
    : port_(std::move(port)),
      watches_(*port_, tree_, options.watches_max),
      queue_(tree_),
      roots_(tree_, watches_, queue_),
      inspector_(tree_, watches_, roots_, queue_),
      translator_(tree_, roots_, inspector_, queue_) {
  if (!options.cookie_file.empty()) WatchCookie(options.cookie_file);
}

void FolderWatcher::WatchCookie(const std::string& file) {
  FolderKey key = 0;
  const base::UniqueFd folder(open(Dirname(file).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  const int error = folder.Valid() ? watches_.Watch(folder.Get(), FolderPort::Wanted::kCookie, key) : errno;
  if (error != 0) Log(LOG_WARNING, "%s cannot be watched: %s", file.c_str(), strerror(error));
  watches_.Keep(key);
  translator_.SetCookie({key, Basename(file)});
}

bool FolderWatcher::Read(WatchListener& listener) {
  if (!port_->Read(records_)) return false;
  for (const FolderRecord& record : records_) translator_.Translate(record, listener);
  return true;
}

bool FolderWatcher::Advance(std::chrono::milliseconds at_most, WatchListener& listener) {
  using Clock = std::chrono::steady_clock;
  const auto end = Clock::now() + at_most;
  if (watches_.IsAllRead()) queue_.OnAllRead();
  do {
    Step(listener);
  } while (HasWork() && Clock::now() < end);
  return HasWork();
}

/// Does one thing. Watches are ended first, since others may need the room; what is in doubt comes before the cookie,
/// and walks, which take long, come last.
void FolderWatcher::Step(WatchListener& listener) {
  if (watches_.HasDropped()) {
    watches_.EndDropped();
  } else if (queue_.HasUrgent()) {
    inspector_.InspectNext(listener);
  } else if (queue_.TakeCookie()) {
    listener.OnCookie();
  } else if (queue_.Walks().HasAny()) {
    inspector_.ContinueWalk(listener);
  } else if (watches_.IsAllRead()) {
    queue_.OnAllRead();
  }
}

}  // namespace ferrox::notifyd
