#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>

#include "base/mutex.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// The places of one index in memory, for all who search it: read when a search first needs them, brought up to date
/// by what was committed since, and given back when no search has needed them for kIdle. A search gets those of its own
/// snapshot, and waits for no commit. Any thread may call any member.
class PlacesCache {
 public:
  using SteadyClock = std::chrono::steady_clock;
  static constexpr std::chrono::minutes kIdle{10};

  /// Those of the snapshot that `database` has a transaction on, whose version (Totals) is `version`. Waits while
  /// another thread reads them. @throws Error kEngineStorage.
  std::shared_ptr<const Places> Load(Database& database, int64_t version);
  bool IsLoaded() const;
  /// When to call GiveBack next; nothing while there is nothing to give back.
  std::optional<SteadyClock::time_point> NextGiveBack() const;
  /// Frees the memory, unless it was used in the last kIdle before `now`.
  void GiveBack(SteadyClock::time_point now);

 private:
  /// Of how many versions they are kept: a search may have begun some commits ago.
  static constexpr size_t kVersions = 3;

  /// The latest up to `version`; null when there are none.
  std::shared_ptr<const Places> Latest(int64_t version);

  base::Mutex load_mutex_;  ///< of who reads from the file; taken before the other
  mutable base::Mutex mutex_;
  std::deque<std::shared_ptr<const Places>> kept_ BASE_GUARDED_BY(mutex_);  ///< in the order of their versions
  SteadyClock::time_point used_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
