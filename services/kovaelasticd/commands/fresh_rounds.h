#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>
#include <thread>

#include "base/mutex.h"
#include "wire/cancellation.h"

namespace ferrox::engine {

/// Asks the daemons whether the indices have all changes, for those who may not ask them. All who wait at one moment
/// share one round: it covers each who waited when it began, and who comes later waits for the next. So at most one is
/// under way, whatever users ask. Any thread may call any member.
class FreshRounds {
 public:
  /// What one round has found: nothing when it cannot be said of any share, else the shares of which it cannot.
  using Outcome = std::optional<std::set<std::string>>;
  /// Asks the daemons of all shares. Called in a thread of its own, whose waits for sockets can be cancelled.
  using Ask = std::function<Outcome()>;
  /// How many requests wait at once: each holds one of the engine's threads.
  static constexpr size_t kWaitersMax = 4;

  explicit FreshRounds(Ask ask) : ask_(std::move(ask)) {}
  FreshRounds(const FreshRounds&) = delete;
  FreshRounds& operator=(const FreshRounds&) = delete;
  /// Nobody may be waiting.
  ~FreshRounds();
  /// Ends all waiting, of now and later, because the engine stops; cuts the round under way short.
  void End();

  struct Answer {
    bool in_time = false;  ///< a round that covers the call has ended
    Outcome outcome = {};
  };
  /// Blocks until a round that begins after the call has ended, at most until `end`.
  /// @throws UserError kEngineUserBusy when a request of this user waits already, or too many do.
  Answer Await(uint32_t uid, std::chrono::steady_clock::time_point end);

 private:
  void RunRounds();

  const Ask ask_;
  wire::Cancellation cancellation_;
  base::Mutex mutex_;
  base::ConditionVariable wake_thread_;
  base::ConditionVariable wake_callers_;
  std::set<uint32_t> waiting_ BASE_GUARDED_BY(mutex_);  ///< users
  uint64_t begun_ BASE_GUARDED_BY(mutex_) = 0;          ///< rounds
  uint64_t ended_ BASE_GUARDED_BY(mutex_) = 0;
  uint64_t wanted_ BASE_GUARDED_BY(mutex_) = 0;  ///< the last that somebody waits for
  Outcome last_ BASE_GUARDED_BY(mutex_);         ///< of the round that ended last
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  std::thread thread_ BASE_GUARDED_BY(mutex_);  ///< from the first call on
};

}  // namespace ferrox::engine
