#pragma once

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/roots/folder_probe.h"
#include "services/kovanotifyd/roots/mount_table.h"
#include "services/kovanotifyd/roots/root_guard.h"
#include "services/kovanotifyd/roots/root_table.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

inline constexpr char kPeriodicScan[] = "periodic scan";

/// A way to learn of changes. Ways are numbered from 0, the best first.
struct Way {
  std::string name;
  std::unique_ptr<Watcher> watcher;  ///< null when it cannot be used,
  std::string refusal = {};          ///< for this reason, without a full stop
};

/// What people can see of how one folder is watched.
struct WatchState {
  std::string way = "none";
  std::string reason = {};  ///< why it is not watched, or not in a better way; "" when it is watched in the best one
  bool covered = false;     ///< whether every change is noticed
  uint64_t kernel_watches = 0;
};

/// Decides which folders are roots and in which way each is watched: the first way that does not refuse it, or, when
/// all refuse, by a comparison of the whole root at intervals. A root whose folder is missing or unusable waits until
/// there is one. A folder that is there again, or is another one than before, is compared once it is covered; so
/// is one that was removed, but not one that went away with its volume. Belongs to one thread.
///
/// A root goes from kWaiting to kSettingUp when its folder is usable and a watcher gets it, to kCovered when that
/// watcher reports OnCovered, and back to kSettingUp after OnLost. OnRefused passes it on to the next way, in the end
/// to kScanned or kWaiting. Examine takes it back to kWaiting when its folder is gone, or begins anew when it is
/// another one.
class WatchSet : private WatchListener {
 public:
  /// Gets what the watchers report of all roots. Called during Follow, Examine, Read, Advance and Scan.
  class Listener {
   public:
    virtual ~Listener() = default;
    virtual void OnChange(Change change) = 0;
    /// Disk and index may differ at and below the path.
    virtual void OnCompare(const std::string& path) = 0;
    /// The watcher of that way lost changes. OnCompare follows for its roots.
    virtual void OnLost(size_t way) = 0;
    /// As WatchListener::OnCookie, for the watcher of that way.
    virtual void OnCookie(size_t way) = 0;
  };

  /// `scans`: whether roots that all watchers refuse are compared at intervals; else they wait.
  WatchSet(std::vector<Way> ways, bool scans, Listener& listener);
  WatchSet(const WatchSet&) = delete;
  WatchSet& operator=(const WatchSet&) = delete;

  /// Takes what is registered from now on, and examines all roots. Nothing else happens to those that stay as they are.
  void Follow(std::vector<Registration> registrations);
  /// Examines whether each root's folder is still the one that is watched, and whether there is one for roots that
  /// wait.
  void Examine();
  /// Whether a watcher reported something that calls for Examine.
  bool IsDisturbed() const { return disturbed_; }
  /// Descriptors that call for Examine when poll reports the events given here. The mount table's is always readable,
  /// and reports a change as POLLPRI.
  std::vector<pollfd> Disturbances() const { return {{guard_.Fd(), POLLIN, 0}, {mounts_.Fd(), POLLPRI, 0}}; }

  size_t Ways() const { return ways_.size(); }
  const std::string& NameOf(size_t way) const { return ways_[way].name; }
  /// As Watcher::Fd; -1 also for a way that cannot be used.
  int FdOf(size_t way) const { return ways_[way].watcher != nullptr ? ways_[way].watcher->Fd() : -1; }
  /// Reads what the way's watcher has to report. False when more may be waiting after many reads.
  bool Read(size_t way);
  /// As Watcher::Advance, for each watcher.
  bool Advance(std::chrono::milliseconds at_most);
  /// Asks for the comparison of all roots that no watcher watches.
  void Scan();

  const RootTable& Roots() const { return roots_; }
  /// Of the root that covers the watch.
  WatchState StateOf(const QueueWatch& watch) const;

 private:
  // Of the watcher that is being called, which is that of active_way_.
  void OnChange(Change change) override;
  void OnCovered(const std::string& path) override;
  void OnRefused(const std::string& path, const std::string& reason) override;
  void OnLost() override;
  void OnRootDisturbed(const std::string& path) override;
  void OnCookie() override;

  void OnMountChanged(const std::string& point);
  void ExamineRoot(RootState& root, bool is_disturbed);
  void OnUnusable(RootState& root, const FolderProbe& probe);
  void Begin(RootState& root, const FolderProbe& probe);
  void Stop(RootState& root);
  void TryNextWay(RootState& root);
  void CompareIfDue(RootState& root);

  std::vector<Way> ways_;
  bool scans_;
  Listener& listener_;
  size_t active_way_ = 0;  ///< whose watcher is being called by Read or Advance
  MountTable mounts_;
  RootGuard guard_;
  std::vector<Registration> registrations_;  ///< as Follow got them
  RootTable roots_;
  bool disturbed_ = false;  ///< since the last Examine
};

}  // namespace ferrox::notifyd
