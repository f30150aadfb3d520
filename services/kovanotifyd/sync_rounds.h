#pragma once

#include <chrono>
#include <future>
#include <string>
#include <vector>

namespace ferrox::notifyd {

/// Requests that want all changes so far to be in the queues, and what they wait for. A round begins with the cookie of
/// each watcher, and is over when each was reported; requests that come meanwhile share the next one. Belongs to one
/// thread.
class SyncRounds {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;
  using Problems = std::vector<std::string>;
  struct Outcome {
    Problems problems = {};
    std::string failure = {};  ///< a sentence, of what was not reached in time
  };

  explicit SyncRounds(size_t ways) : cookies_(ways, Cookie::kIdle) {}

  void Add(std::promise<Outcome> request, TimePoint deadline) { next_.push_back({std::move(request), deadline}); }
  /// Fails the requests whose time is over. Returns when the next one's is, or TimePoint::max().
  TimePoint Expire(TimePoint now, const std::string& sentence);

  bool IsRunning() const { return is_running_; }
  bool IsWanted() const { return !is_running_ && !next_.empty(); }
  /// What is waited for, by number of way.
  std::vector<size_t> Outstanding() const;

  /// Begins a round for all that wait.
  void Begin();
  void Touched(size_t way) { cookies_[way] = Cookie::kOutstanding; }
  void Reported(size_t way) { cookies_[way] = Cookie::kIdle; }
  /// The watcher lost changes, maybe that of the cookie.
  void Lost(size_t way);
  /// All that had happened until a moment behind the last Lost was reported.
  void Drained(size_t way);
  void End(const Problems& problems);

 private:
  enum class Cookie { kIdle, kOutstanding, kUncertain };
  struct Request {
    std::promise<Outcome> promise;
    TimePoint deadline;
  };

  std::vector<Cookie> cookies_;
  std::vector<Request> next_;
  std::vector<Request> current_;
  bool is_running_ = false;
};

}  // namespace ferrox::notifyd
