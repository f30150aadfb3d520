#pragma once

#include <chrono>
#include <cstddef>
#include <future>
#include <string>
#include <vector>

#include "services/kovanotifyd/cookie.h"
#include "services/kovanotifyd/roots/root_table.h"

namespace ferrox::notifyd {

/// Requests for all changes so far to be in the queues. They are answered in rounds: a round touches the cookie of each
/// way that covers a root, and is over when every watcher has reported its cookie, which it does behind all earlier
/// changes, and no root is being set up. Requests that come during a round wait for the next one. Belongs to one
/// thread.
class SyncRounds {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;
  using Problems = std::vector<std::string>;
  struct Outcome {
    Problems problems = {};    ///< a sentence for each thing that keeps changes out of the queues
    std::string failure = {};  ///< a sentence that says what was waited for when the time was over; else ""
  };

  /// `cookies`: one for each way.
  explicit SyncRounds(std::vector<Cookie> cookies)
      : cookies_(std::move(cookies)), states_(cookies_.size(), CookieState::kIdle) {}

  void Add(std::promise<Outcome> request, TimePoint deadline) { next_.push_back({std::move(request), deadline}); }
  /// Fails the requests whose deadline has come. Returns the next deadline, or TimePoint::max().
  TimePoint Expire(TimePoint now, const std::string& sentence);
  /// Breaks the promises of all requests: the daemon is being stopped.
  void DropRequests();

  bool IsRunning() const { return is_running_; }
  bool IsWanted() const { return !is_running_ && !next_.empty(); }
  /// Begins a round for all requests that wait. A way that is being set up gets no cookie, since its watcher could miss
  /// it; what it covers is compared afterwards, which includes every change.
  void Begin(const RootTable& roots);
  /// Whether everything that the round waits for has happened. A way that has no root any more is not waited for.
  bool IsDone(const RootTable& roots);
  /// Answers the requests of the round with its own problems and these.
  void End(const Problems& problems);
  /// The ways whose cookie the round waits for.
  std::vector<size_t> Outstanding() const;

  // What the watcher of a way reports.
  void OnCookie(size_t way) { states_[way] = CookieState::kIdle; }
  /// It lost changes, maybe that of the cookie.
  void OnLost(size_t way);
  /// It reported all that happened before a moment after the last OnLost. What was lost is compared, and the change of
  /// the cookie either came before or was lost too: it is not waited for.
  void OnAllRead(size_t way);

 private:
  enum class CookieState { kIdle, kOutstanding, kMaybeLost };
  struct Request {
    std::promise<Outcome> promise;
    TimePoint deadline;
  };

  std::vector<Cookie> cookies_;
  std::vector<CookieState> states_;  ///< by way
  std::vector<Request> next_;        ///< for the next round
  std::vector<Request> current_;     ///< of the round under way
  Problems problems_;                ///< of the round under way
  bool is_running_ = false;
};

}  // namespace ferrox::notifyd
