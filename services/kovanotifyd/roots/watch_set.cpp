#include "services/kovanotifyd/roots/watch_set.h"

#include <syslog.h>

#include <set>
#include <tuple>
#include <utility>

#include <kova/fs.h>

#include "base/path.h"
#include "common/log.h"
#include "services/kovanotifyd/roots/watch_roots.h"

namespace ferrox::notifyd {

namespace {

using SteadyClock = std::chrono::steady_clock;
using Phase = RootState::Phase;

constexpr char kRemote[] = "changes that are made elsewhere on a remote file system are not reported";
/// After which a root that all ways refused is offered to them again.
constexpr std::chrono::minutes kRetryInterval{10};
/// Of one watcher in a row, so that the others, and requests, get their turn under constant changes.
constexpr int kReadsMax = 64;

/// The watches, each taken with its queue, that are in `now` and not in `before`.
std::vector<QueueWatch> Added(const std::vector<Registration>& now, const std::vector<Registration>& before) {
  std::set<std::tuple<std::string, std::string, uint32_t, std::vector<std::string>>> known;
  for (const Registration& registration : before) {
    for (const QueueWatch& watch : registration.watches) {
      known.emplace(registration.queue, watch.path, watch.mask, watch.ignore);
    }
  }
  std::vector<QueueWatch> added;
  for (const Registration& registration : now) {
    for (const QueueWatch& watch : registration.watches) {
      if (known.count({registration.queue, watch.path, watch.mask, watch.ignore}) == 0) added.push_back(watch);
    }
  }
  return added;
}

}  // namespace

WatchSet::WatchSet(std::vector<Way> ways, bool scans, Listener& listener)
    : ways_(std::move(ways)), scans_(scans), listener_(listener) {}

/// What a queue begins to watch in a folder that is covered already is compared: it may have changed since the queue's
/// owner read it.
void WatchSet::Follow(std::vector<Registration> registrations) {
  const std::vector<QueueWatch> added = Added(registrations, registrations_);
  registrations_ = std::move(registrations);
  Examine();
  for (const QueueWatch& watch : added) {
    const RootState* root = roots_.CoveringRoot(watch);
    const bool is_covered = root != nullptr && (root->phase == Phase::kCovered || root->phase == Phase::kScanned);
    if (is_covered) listener_.OnCompare(watch.path);
  }
}

void WatchSet::Examine() {
  disturbed_ = false;
  mounts_.Read();
  const std::set<std::string> disturbed = guard_.Read();
  const auto is_on_one_mount = [this](const std::string& outer, const std::string& inner) {
    const FolderProbe above = ProbeFolder(outer, mounts_);
    const FolderProbe below = ProbeFolder(inner, mounts_);
    return above.problem.empty() && below.problem.empty() && below.identity.IsOnMountOf(above.identity);
  };
  RootTable::Roots dropped = roots_.Replace(WatchRoots(registrations_, is_on_one_mount));
  for (auto& [path, root] : dropped) Stop(root);
  for (auto& [path, root] : roots_) ExamineRoot(root, disturbed.count(path) != 0);
  for (const std::string& point : mounts_.TakeChanged()) OnMountChanged(point);
}

/// What is mounted below a root hides what is there, which is visible again when it is unmounted: both are compared. A
/// watcher with a watch for each folder has none for those that were hidden, so the root is set up again. Where a
/// registered folder lies there, ExamineRoot has done what is due, since that folder may lie on the volume.
void WatchSet::OnMountChanged(const std::string& point) {
  for (const Registration& registration : registrations_) {
    for (const QueueWatch& watch : registration.watches) {
      if (base::IsAtOrBelow(watch.path, point)) return;
    }
  }
  bool is_below = false;
  for (auto& [path, root] : roots_) {
    if (!root.IsWatched() || !base::IsAtOrBelow(point, path)) continue;
    is_below = true;
    const bool may_lack_watches = root.phase != Phase::kScanned && ways_[root.way].watcher->WatchesEachFolder();
    if (may_lack_watches && !mounts_.IsMountedAt(point)) ExamineRoot(root, true);
  }
  if (is_below) listener_.OnCompare(point);
}

/// Begins anew with a root when it was disturbed, when its folder is another one, or when it waits and may be tried.
void WatchSet::ExamineRoot(RootState& root, bool is_disturbed) {
  const FolderProbe probe = ProbeFolder(root.watch.path, mounts_);
  if (probe.result != FolderProbe::Result::kUsable) return OnUnusable(root, probe);
  const bool is_new = is_disturbed || root.identity != probe.identity;
  if (is_new || (!root.IsWatched() && SteadyClock::now() >= root.retry_at)) Begin(root, probe);
}

void WatchSet::OnUnusable(RootState& root, const FolderProbe& probe) {
  const bool was_watched = root.IsWatched();
  Stop(root);
  root.reason = probe.problem;
  root.retry_at = {};
  if (!was_watched) return;
  Log(LOG_WARNING, "%s is not watched any more: it %s", root.watch.path.c_str(), probe.problem.c_str());
  const bool was_removed = probe.result == FolderProbe::Result::kGone && mounts_.IsMounted(root.mount);
  if (was_removed) listener_.OnCompare(root.watch.path);
}

/// A folder that is only visible again since what was mounted over it is gone is not compared.
void WatchSet::Begin(RootState& root, const FolderProbe& probe) {
  Stop(root);
  root.compare = !mounts_.IsUncovered(root.mount, probe.identity.mount);
  root.identity = probe.identity;
  root.mount = mounts_.Find(probe.identity.mount);
  root.way = 0;
  root.reason.clear();
  if (!mounts_.IsNetwork(probe.identity.mount)) guard_.Add(root.watch.path);
  TryNextWay(root);
}

void WatchSet::Stop(RootState& root) {
  if (!root.IsWatched()) return;
  guard_.Remove(root.watch.path);
  if (root.phase != Phase::kScanned) ways_[root.way].watcher->Remove(root.watch.path);
  root.phase = Phase::kWaiting;
}

/// Gives the root to the first watcher from `root.way` on that may have it.
void WatchSet::TryNextWay(RootState& root) {
  const std::string& path = root.watch.path;
  const bool is_remote = mounts_.IsNetwork(root.mount.id) || KOVAFSIsRemoteFS(KOVAGetFSType(path.c_str(), 0)) == 1;
  for (; root.way < ways_.size(); ++root.way) {
    const Way& way = ways_[root.way];
    if (way.watcher != nullptr && !is_remote) {
      root.phase = Phase::kSettingUp;
      way.watcher->Add(root.watch);
      return;
    }
    root.AddReason(way.name, way.watcher != nullptr ? kRemote : way.refusal);
  }
  if (scans_) {
    root.phase = Phase::kScanned;
    return CompareIfDue(root);
  }
  root.AddReason(kPeriodicScan, "switched off in the settings");
  root.phase = Phase::kWaiting;
  root.retry_at = SteadyClock::now() + kRetryInterval;
  guard_.Remove(root.watch.path);
}

void WatchSet::CompareIfDue(RootState& root) {
  if (std::exchange(root.compare, true)) listener_.OnCompare(root.watch.path);
}

bool WatchSet::Read(size_t way) {
  if (ways_[way].watcher == nullptr) return true;
  active_way_ = way;
  for (int i = 0; i < kReadsMax; ++i) {
    if (!ways_[way].watcher->Read(*this)) return true;
  }
  return false;
}

bool WatchSet::Advance(std::chrono::milliseconds at_most) {
  bool is_more = false;
  for (size_t way = 0; way < ways_.size(); ++way) {
    active_way_ = way;
    if (ways_[way].watcher != nullptr && ways_[way].watcher->Advance(at_most, *this)) is_more = true;
  }
  return is_more;
}

void WatchSet::Scan() {
  for (const auto& [path, root] : roots_) {
    if (root.phase == Phase::kScanned) listener_.OnCompare(path);
  }
}

void WatchSet::OnChange(Change change) { listener_.OnChange(std::move(change)); }

void WatchSet::OnCovered(const std::string& path) {
  RootState* root = roots_.Find(active_way_, path);
  if (root == nullptr) return;
  root->phase = Phase::kCovered;
  CompareIfDue(*root);
}

void WatchSet::OnRefused(const std::string& path, const std::string& reason) {
  RootState* root = roots_.Find(active_way_, path);
  if (root == nullptr) return;
  root->AddReason(ways_[active_way_].name, reason);
  ++root->way;
  TryNextWay(*root);
}

void WatchSet::OnLost() {
  for (auto& [path, root] : roots_) {
    if (root.phase == Phase::kCovered && root.way == active_way_) root.phase = Phase::kSettingUp;
  }
  listener_.OnLost(active_way_);
}

void WatchSet::OnRootDisturbed(const std::string&) { disturbed_ = true; }
void WatchSet::OnCookie() { listener_.OnCookie(active_way_); }

WatchState WatchSet::StateOf(const QueueWatch& watch) const {
  const RootState* root = roots_.CoveringRoot(watch);
  if (root == nullptr) return {};
  WatchState state;
  state.reason = root->reason;
  if (!root->IsWatched()) return state;
  const bool is_scanned = root->phase == Phase::kScanned;
  state.way = is_scanned ? kPeriodicScan : ways_[root->way].name;
  state.covered = root->phase == Phase::kCovered;
  state.kernel_watches = is_scanned ? 0 : ways_[root->way].watcher->Watches(root->watch.path);
  return state;
}

}  // namespace ferrox::notifyd
