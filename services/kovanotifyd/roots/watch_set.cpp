#include "services/kovanotifyd/roots/watch_set.h"

#include <syslog.h>

#include <algorithm>
#include <tuple>

#include <kova/fs.h>

#include "base/path.h"
#include "common/log.h"
#include "services/kovanotifyd/roots/watch_roots.h"

namespace ferrox::notifyd {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr char kRemote[] = "changes that are made elsewhere on a remote file system are not reported";
/// What all refused is offered to them again after so long.
constexpr std::chrono::minutes kRetryInterval{10};
constexpr int kReadsMax = 64;

/// The watches, each with its queue, that are in the first and not in the second.
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

struct WatchSet::Root {
  enum class State { kWaiting, kSettingUp, kCovered };

  WatchRoot watch;
  State state = State::kWaiting;
  size_t way = 0;                               ///< unless it waits; the number of ways stands for scans
  std::string reason = {};                      ///< why it waits, or why each better way was refused
  std::optional<FolderIdentity> identity = {};  ///< of what was watched last
  Mount mount = {};                             ///< on which that lay
  bool compare = true;                          ///< once covered
  SteadyClock::time_point retry_at = {};        ///< when all have refused it

  bool IsNotThere() const { return state == State::kWaiting && retry_at == SteadyClock::time_point{}; }
  void AddReason(const std::string& name, const std::string& refusal) {
    reason += (reason.empty() ? "" : "; ") + name + ": " + refusal;
  }
};

/// Knows which watcher speaks.
class WatchSet::Ear : public WatchListener {
 public:
  Ear(WatchSet& set, size_t way) : set_(set), way_(way) {}

  void OnChange(Change change) override { set_.listener_.OnChange(std::move(change)); }

  void OnCovered(const std::string& path) override {
    Root* root = set_.Find(way_, path);
    if (root == nullptr) return;
    root->state = Root::State::kCovered;
    if (std::exchange(root->compare, true)) set_.listener_.OnCompare(path);
  }

  void OnRefused(const std::string& path, const std::string& reason) override {
    Root* root = set_.Find(way_, path);
    if (root == nullptr) return;
    root->AddReason(set_.ways_[way_].name, reason);
    ++root->way;
    set_.TryNext(*root);
  }

  void OnLost() override {
    for (auto& [path, root] : set_.roots_) {
      if (root.way == way_ && root.state == Root::State::kCovered) root.state = Root::State::kSettingUp;
    }
    set_.listener_.OnLost(way_);
  }

  void OnRootDisturbed(const std::string&) override { set_.disturbed_ = true; }
  void OnCookie() override { set_.listener_.OnCookie(way_); }

 private:
  WatchSet& set_;
  size_t way_;
};

WatchSet::WatchSet(std::vector<Way> ways, bool scans, Listener& listener)
    : ways_(std::move(ways)), scans_(scans), listener_(listener) {
  for (size_t way = 0; way < ways_.size(); ++way) ears_.push_back(std::make_unique<Ear>(*this, way));
}

WatchSet::~WatchSet() = default;

/// What joins a folder that is covered already is compared: it may have changed since its application looked at it.
void WatchSet::Follow(std::vector<Registration> registrations) {
  const std::vector<QueueWatch> added = Added(registrations, registrations_);
  registrations_ = std::move(registrations);
  Examine();
  for (const QueueWatch& watch : added) {
    const Root* root = RootOf(watch);
    if (root != nullptr && root->state == Root::State::kCovered) listener_.OnCompare(watch.path);
  }
}

void WatchSet::Examine() {
  disturbed_ = false;
  mounts_.Read();
  const std::set<std::string> disturbed = guard_.Read();
  const auto is_on_one_mount = [this](const std::string& outer, const std::string& inner) {
    const FolderLook above = Look(outer);
    const FolderLook below = Look(inner);
    return above.problem.empty() && below.problem.empty() && below.identity.IsOnMountOf(above.identity);
  };
  ChangeRoots(WatchRoots(registrations_, is_on_one_mount));
  for (auto& [path, root] : roots_) ExamineRoot(root, disturbed.count(path) != 0);
  for (const std::string& point : mounts_.TakeChanged()) OnMountChanged(point);
}

/// What is mounted below a folder hides what is there, which comes to light again afterwards. A registered folder there
/// is looked at as such, since it may lie on the volume that went.
void WatchSet::OnMountChanged(const std::string& point) {
  for (const Registration& registration : registrations_) {
    for (const QueueWatch& watch : registration.watches) {
      if (base::IsAtOrBelow(watch.path, point)) return;
    }
  }
  bool is_below = false;
  for (auto& [path, root] : roots_) {
    if (root.state == Root::State::kWaiting || !base::IsAtOrBelow(point, path)) continue;
    is_below = true;
    const bool may_lack_watches = !IsScanned(root) && ways_[root.way].watcher->WatchesEachFolder();
    if (may_lack_watches && !mounts_.IsMountedAt(point)) ExamineRoot(root, true);
  }
  if (is_below) listener_.OnCompare(point);
}

/// A folder whose server may not answer is taken for what it is said to be.
FolderLook WatchSet::Look(const std::string& path) const {
  const uint64_t mount = mounts_.MountOf(path);
  FolderLook look;
  if (mounts_.IsNetwork(mount)) {
    look.result = FolderLook::Result::kUsable;
  } else {
    look = LookAtFolder(path);
  }
  if (look.identity.mount == 0) look.identity.mount = mount;
  return look;
}

void WatchSet::ChangeRoots(const std::vector<WatchRoot>& roots) {
  Roots kept;
  for (const WatchRoot& watch : roots) {
    const auto known = roots_.find(watch.path);
    if (known != roots_.end() && known->second.watch.ignore == watch.ignore) {
      kept.insert(roots_.extract(known));
    } else {
      kept.emplace(watch.path, Root{watch});
    }
  }
  for (auto& [path, root] : roots_) Stop(root);
  roots_ = std::move(kept);
}

void WatchSet::ExamineRoot(Root& root, bool is_disturbed) {
  const FolderLook look = Look(root.watch.path);
  const bool was_watched = root.state != Root::State::kWaiting;
  if (look.result != FolderLook::Result::kUsable) {
    Stop(root);
    root.reason = look.problem;
    root.retry_at = {};
    if (was_watched)
      Log(LOG_WARNING, "%s is not watched any more: it %s", root.watch.path.c_str(), look.problem.c_str());
    const bool was_removed = look.result == FolderLook::Result::kGone && mounts_.IsMounted(root.mount);
    if (was_watched && was_removed) listener_.OnCompare(root.watch.path);
    return;
  }
  const bool is_new = is_disturbed || root.identity != look.identity;
  if (is_new || (!was_watched && SteadyClock::now() >= root.retry_at)) Begin(root, look);
}

/// Whether the folder came to light because what had been mounted over it went.
bool WatchSet::IsUncovered(const Root& root, const FolderLook& look) const {
  const std::vector<uint64_t>& beneath = root.mount.beneath;
  return !mounts_.IsMounted(root.mount) &&
         std::find(beneath.begin(), beneath.end(), look.identity.mount) != beneath.end();
}

void WatchSet::Begin(Root& root, const FolderLook& look) {
  Stop(root);
  root.compare = !IsUncovered(root, look);
  root.identity = look.identity;
  root.mount = mounts_.Find(look.identity.mount);
  root.way = 0;
  root.reason.clear();
  if (!mounts_.IsNetwork(look.identity.mount)) guard_.Add(root.watch.path);
  TryNext(root);
}

void WatchSet::Stop(Root& root) {
  if (root.state == Root::State::kWaiting) return;
  guard_.Remove(root.watch.path);
  if (!IsScanned(root)) ways_[root.way].watcher->Remove(root.watch.path);
  root.state = Root::State::kWaiting;
}

void WatchSet::TryNext(Root& root) {
  const std::string& path = root.watch.path;
  const bool is_remote = mounts_.IsNetwork(root.mount.id) || KOVAFSIsRemoteFS(KOVAGetFSType(path.c_str(), 0)) == 1;
  for (; root.way < ways_.size(); ++root.way) {
    const Way& way = ways_[root.way];
    if (way.watcher != nullptr && !is_remote) {
      root.state = Root::State::kSettingUp;
      way.watcher->Add(root.watch);
      return;
    }
    root.AddReason(way.name, way.watcher != nullptr ? kRemote : way.refusal);
  }
  if (scans_) {
    root.state = Root::State::kCovered;
    if (std::exchange(root.compare, true)) listener_.OnCompare(root.watch.path);
    return;
  }
  root.AddReason(kPeriodicScan, "switched off in the settings");
  root.state = Root::State::kWaiting;
  root.retry_at = SteadyClock::now() + kRetryInterval;
  guard_.Remove(root.watch.path);
}

WatchSet::Root* WatchSet::Find(size_t way, const std::string& path) {
  const auto found = roots_.find(path);
  const bool is_its = found != roots_.end() && found->second.state != Root::State::kWaiting && found->second.way == way;
  return is_its ? &found->second : nullptr;
}

/// The folder itself, or the nearest one that covers it.
const WatchSet::Root* WatchSet::RootOf(const QueueWatch& watch) const {
  const Root* nearest = nullptr;
  for (const auto& [path, root] : roots_) {
    if (Covers(root.watch, {watch.path, watch.ignore})) nearest = &root;
  }
  return nearest;
}

bool WatchSet::IsScanned(const Root& root) const {
  return root.state == Root::State::kCovered && root.way == ways_.size();
}

bool WatchSet::IsCovering(size_t way) const {
  return std::any_of(roots_.begin(), roots_.end(), [way](const auto& entry) {
    return entry.second.state == Root::State::kCovered && entry.second.way == way;
  });
}

bool WatchSet::Read(size_t way) {
  if (ways_[way].watcher == nullptr) return true;
  for (int i = 0; i < kReadsMax; ++i) {
    if (!ways_[way].watcher->Read(*ears_[way])) return true;
  }
  return false;
}

bool WatchSet::Advance(std::chrono::milliseconds at_most) {
  bool is_more = false;
  for (size_t way = 0; way < ways_.size(); ++way) {
    if (ways_[way].watcher != nullptr && ways_[way].watcher->Advance(at_most, *ears_[way])) is_more = true;
  }
  return is_more;
}

void WatchSet::Scan() {
  for (const auto& [path, root] : roots_) {
    if (IsScanned(root)) listener_.OnCompare(path);
  }
}

bool WatchSet::HasScans() const {
  return std::any_of(roots_.begin(), roots_.end(), [this](const auto& entry) { return IsScanned(entry.second); });
}

bool WatchSet::IsSettingUp() const {
  return std::any_of(roots_.begin(), roots_.end(),
                     [](const auto& entry) { return entry.second.state == Root::State::kSettingUp; });
}

bool WatchSet::IsWaiting() const {
  return std::any_of(roots_.begin(), roots_.end(), [](const auto& entry) { return entry.second.IsNotThere(); });
}

WatchState WatchSet::StateOf(const QueueWatch& watch) const {
  const Root* root = RootOf(watch);
  if (root == nullptr) return {};
  WatchState state;
  state.reason = root->reason;
  if (root->state == Root::State::kWaiting) return state;
  const bool is_scanned = IsScanned(*root);
  state.way = is_scanned ? kPeriodicScan : ways_[root->way].name;
  state.covered = !is_scanned && root->state == Root::State::kCovered;
  state.kernel_watches = is_scanned ? 0 : ways_[root->way].watcher->Watches(root->watch.path);
  return state;
}

std::vector<std::string> WatchSet::Problems() const {
  std::vector<std::string> problems;
  for (const auto& [path, root] : roots_) {
    if (root.state != Root::State::kWaiting) continue;
    problems.push_back("changes of " + path + " are not noticed: " + (root.IsNotThere() ? "it " : "") + root.reason);
  }
  return problems;
}

}  // namespace ferrox::notifyd
