#pragma once

#include <poll.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/roots/folder_look.h"
#include "services/kovanotifyd/roots/mount_table.h"
#include "services/kovanotifyd/roots/root_guard.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

inline constexpr char kPeriodicScan[] = "periodic scan";

/// A way to learn of changes.
struct Way {
  std::string name;
  std::unique_ptr<Watcher> watcher;  ///< null: it is not to be used,
  std::string refusal = {};          ///< and why, without a full stop
};

/// What people can see of the watching of one folder.
struct WatchState {
  std::string way = "none";
  std::string reason = {};  ///< why it is not watched, or not in a better way; "" when it is watched in the best one
  bool covered = false;     ///< whether each change is noticed
  uint64_t kernel_watches = 0;
};

/// Which folder is watched in which way: the first that does not refuse it, and a comparison of all of it now and then
/// where all do. Folders that are not there, or are no folders, wait until they are. A folder that comes, or comes
/// again, is compared when it is covered; one that was removed is compared too, but not one that went with its volume.
/// Belongs to one thread.
class WatchSet {
 public:
  /// Whom it tells.
  class Listener {
   public:
    virtual ~Listener() = default;
    virtual void OnChange(Change change) = 0;
    /// Disk and index may differ at and below the path.
    virtual void OnCompare(const std::string& path) = 0;
    /// The watcher of that number lost changes; comparisons follow.
    virtual void OnLost(size_t way) = 0;
    virtual void OnCookie(size_t way) = 0;
  };

  /// `ways`: the best first. `scans`: whether what nobody can watch is compared now and then.
  WatchSet(std::vector<Way> ways, bool scans, Listener& listener);
  WatchSet(const WatchSet&) = delete;
  WatchSet& operator=(const WatchSet&) = delete;
  ~WatchSet();

  /// What is registered from now on. Folders that stay as they are are left alone.
  void Follow(std::vector<Registration> registrations);
  /// Looks whether each folder is still the one that is watched, and for those that wait.
  void Examine();
  /// Whether something happened that calls for Examine.
  bool IsDisturbed() const { return disturbed_; }
  /// To be polled, calling for Examine. The mount table is always readable: only POLLPRI tells of a change.
  std::vector<pollfd> Disturbances() const { return {{guard_.Fd(), POLLIN, 0}, {mounts_.Fd(), POLLPRI, 0}}; }

  size_t Ways() const { return ways_.size(); }
  const std::string& NameOf(size_t way) const { return ways_[way].name; }
  /// Readable when Read has something to do; -1: never.
  int FdOf(size_t way) const { return ways_[way].watcher != nullptr ? ways_[way].watcher->Fd() : -1; }
  /// Whether a folder is watched that way, already covered.
  bool IsCovering(size_t way) const;
  /// Takes what has happened; false when that was not yet all.
  bool Read(size_t way);
  /// Goes on with what takes time, for about `at_most`; false when nothing is left to do.
  bool Advance(std::chrono::milliseconds at_most);

  /// Compares what nobody can watch.
  void Scan();
  bool HasScans() const;
  bool IsSettingUp() const;
  bool IsWaiting() const;

  WatchState StateOf(const QueueWatch& watch) const;
  /// A sentence for each folder whose changes are not noticed at all.
  std::vector<std::string> Problems() const;

 private:
  struct Root;
  class Ear;
  using Roots = std::map<std::string, Root>;

  FolderLook Look(const std::string& path) const;
  void ChangeRoots(const std::vector<WatchRoot>& roots);
  void OnMountChanged(const std::string& point);
  void ExamineRoot(Root& root, bool is_disturbed);
  void Begin(Root& root, const FolderLook& look);
  void Stop(Root& root);
  void TryNext(Root& root);
  bool IsUncovered(const Root& root, const FolderLook& look) const;
  Root* Find(size_t way, const std::string& path);
  const Root* RootOf(const QueueWatch& watch) const;
  bool IsScanned(const Root& root) const;

  std::vector<Way> ways_;
  std::vector<std::unique_ptr<Ear>> ears_;  ///< one a way: its watcher's listener
  bool scans_;
  Listener& listener_;
  MountTable mounts_;
  RootGuard guard_;
  std::vector<Registration> registrations_;
  Roots roots_;
  bool disturbed_ = false;
};

}  // namespace ferrox::notifyd
