#include "services/kovanotifyd/folders/folder_watcher.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <syslog.h>

#include <cstring>

#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::notifyd {

namespace {

using Clock = std::chrono::steady_clock;

constexpr size_t kDeadAtOnce = 64;

}  // namespace

FolderWatcher::FolderWatcher(std::unique_ptr<FolderPort> port, const Options& options)
    : port_(std::move(port)), cookie_name_(Basename(options.cookie_file)) {
  watches_max_ = options.watches_max != 0 ? options.watches_max : port_->WatchLimit().watches / 10 * 8;
  if (watches_max_ == 0) watches_max_ = UINT64_MAX;
  if (options.cookie_file.empty()) return;
  const base::UniqueFd folder(open(Dirname(options.cookie_file).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  const int error = folder.Valid() ? port_->Watch(folder.Get(), FolderPort::Wanted::kCookie, cookie_folder_) : errno;
  if (error != 0) Log(LOG_WARNING, "%s cannot be watched: %s", options.cookie_file.c_str(), strerror(error));
}

bool FolderWatcher::Read(WatchListener& listener) {
  if (!port_->Read(records_)) return false;
  for (const FolderRecord& record : records_) OnRecord(record, listener);
  return true;
}

bool FolderWatcher::HasWork() const {
  return !dead_.empty() || !checks_.empty() || !places_.empty() || !walks_.empty() || !doubts_.empty() ||
         cookie_ != Cookie::kNone;
}

bool FolderWatcher::Advance(std::chrono::milliseconds at_most, WatchListener& listener) {
  const auto end = Clock::now() + at_most;
  if (IsAllRead()) OnAllRead();
  do {
    Step(listener);
  } while (HasWork() && Clock::now() < end);
  return HasWork();
}

void FolderWatcher::Step(WatchListener& listener) {
  if (!dead_.empty()) {
    UnwatchDead();
  } else if (!checks_.empty()) {
    const Check check = checks_.back();
    checks_.pop_back();
    const Id id = tree_.Get(check.folder);
    if (id != kNone && IsCovered(id)) LookAndReport(id, check.always, listener);
  } else if (!places_.empty()) {
    const Place place = std::move(places_.back());
    places_.pop_back();
    CheckPlace(place, listener);
  } else if (cookie_ == Cookie::kAfterLooks) {
    cookie_ = Cookie::kNone;
    listener.OnCookie();
  } else if (!walks_.empty()) {
    StepWalk(listener);
  } else if (IsAllRead()) {
    OnAllRead();
  }
}

void FolderWatcher::StepWalk(WatchListener& listener) {
  Walk& walk = walks_.front();
  const std::string path = walk.root;
  if (!walk.ahead.empty()) {
    const Id id = tree_.Get(walk.ahead.back());
    walk.ahead.pop_back();
    std::vector<Ref> below;
    if (id != kNone && IsCovered(id)) (void)Look(id, true, below, listener);
    if (walks_.empty() || walks_.front().root != path) return;  // refused meanwhile
    walks_.front().ahead.insert(walks_.front().ahead.end(), below.begin(), below.end());
    return;
  }
  walks_.pop_front();
  const Id id = tree_.Get(roots_.at(path).folder);
  if (id == kNone || tree_.Key(id) == 0) return Refuse(path, "it was moved or removed", listener);
  listener.OnCovered(path);
}

void FolderWatcher::UnwatchDead() {
  for (size_t i = 0; i < kDeadAtOnce && !dead_.empty(); ++i) {
    const auto [key, path] = std::move(dead_.back());
    dead_.pop_back();
    if (tree_.ByKey(key) == kNone && key != cookie_folder_) port_->Unwatch(key, path);
  }
}

bool FolderWatcher::IsAllRead() const {
  pollfd polled = {port_->Fd(), POLLIN, 0};
  return poll(&polled, 1, 0) == 0;
}

/// The tree shows now what the disk was when the folders were looked at. One that was moved since then, by itself or
/// with those above it, may have been another.
void FolderWatcher::OnAllRead() {
  for (const Ref ref : std::exchange(looked_at_, {})) {
    const Id id = tree_.Get(ref);
    if (id != kNone && IsMoved(id)) checks_.push_back({ref, false});
  }
  for (const Ref ref : std::exchange(moved_, {})) {
    const Id id = tree_.Get(ref);
    if (id != kNone) tree_.Set(id, FolderTree::kMoved, false);
  }
  for (Place& place : std::exchange(doubts_, {})) places_.push_back(std::move(place));
  if (cookie_ == Cookie::kAfterAllRead) cookie_ = Cookie::kAfterLooks;
}

bool FolderWatcher::IsMoved(Id id) const {
  while (id != FolderTree::kTop && !tree_.Has(id, FolderTree::kMoved)) id = tree_.Parent(id);
  return id != FolderTree::kTop;
}

}  // namespace ferrox::notifyd
