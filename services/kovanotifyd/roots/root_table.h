#pragma once

#include <chrono>
#include <cstddef>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "services/kovanotifyd/queues/queue_watch.h"
#include "services/kovanotifyd/roots/folder_probe.h"
#include "services/kovanotifyd/roots/mount_table.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// A root, and in which way it is watched at present or why it is not.
struct RootState {
  using TimePoint = std::chrono::steady_clock::time_point;
  enum class Phase {
    kWaiting,    ///< not watched: there is no usable folder, or all ways refused it
    kSettingUp,  ///< its watcher does not report every change yet
    kCovered,    ///< its watcher reports every change
    kScanned,    ///< refused by all watchers; compared at intervals
  };

  WatchRoot watch;
  Phase phase = Phase::kWaiting;
  size_t way = 0;                               ///< of kSettingUp and kCovered: the number of its way
  std::string reason = {};                      ///< why it waits, or why each better way refused it
  std::optional<FolderIdentity> identity = {};  ///< of the folder that was watched last
  Mount mount = {};                             ///< that this folder was on
  bool compare = true;                          ///< whether to compare it once it is covered
  TimePoint retry_at = {};                      ///< when to try all ways again after all refused it

  bool IsWatched() const { return phase != Phase::kWaiting; }
  /// Whether it waits for a usable folder.
  bool IsMissing() const { return phase == Phase::kWaiting && retry_at == TimePoint{}; }
  void AddReason(const std::string& way_name, const std::string& refusal) {
    reason += (reason.empty() ? "" : "; ") + way_name + ": " + refusal;
  }
};

/// The roots by their paths.
class RootTable {
 public:
  using Roots = std::map<std::string, RootState>;

  Roots::iterator begin() { return roots_.begin(); }
  Roots::iterator end() { return roots_.end(); }

  /// Takes `watches` for the roots. One that is there already with the same names to ignore keeps its state.
  /// @return the roots that are no longer there, or begin anew.
  Roots Replace(const std::vector<WatchRoot>& watches);

  /// The root at the path if it is watched by that way's watcher; else null.
  RootState* Find(size_t way, const std::string& path);
  /// The nearest root that covers what a queue watches, which may be the folder itself; null without.
  const RootState* CoveringRoot(const QueueWatch& watch) const;

  bool HasScanned() const { return Has(RootState::Phase::kScanned); }
  bool IsSettingUp() const { return Has(RootState::Phase::kSettingUp); }
  /// Whether a root waits for its folder.
  bool HasMissing() const;
  /// Whether that way's watcher reports every change of some root.
  bool IsCovering(size_t way) const;
  /// A sentence for each root whose changes are not noticed at all.
  std::vector<std::string> Problems() const;

 private:
  bool Has(RootState::Phase phase) const;

  Roots roots_;
};

}  // namespace ferrox::notifyd
