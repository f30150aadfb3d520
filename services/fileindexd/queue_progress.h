#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <mutex>
#include <string>

namespace ferrox::indexd {

/// How far a worker is with its queue, for others who wait until what was queued when they asked is in the index. Every
/// call is safe from any thread.
class QueueProgress {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  /// A request that what is queued by now be carried out; later requests have higher numbers.
  uint64_t Ask();
  /// The requests that work begun from now on serves: all up to this one.
  uint64_t Asked() const;
  /// Whether a request waits for the work to come.
  bool IsAwaited() const;

  /// What was queued at the request, and at all before it, is in the index.
  void Done(uint64_t request);
  /// The work for the request, and for all before it, cannot be done now.
  void Failed(uint64_t request, const std::string& reason);
  /// No work comes any more: ends every wait, also those to come.
  void End(const std::string& reason);

  enum class Result { kDone, kFailed, kTimeout };
  /// Waits for the outcome of a request, at most until `end`. `reason` is filled when it failed.
  Result Wait(uint64_t request, TimePoint end, std::string& reason);

 private:
  mutable std::mutex mutex_;
  std::condition_variable changed_;
  uint64_t asked_ = 0;
  uint64_t done_ = 0;
  uint64_t failed_ = 0;
  std::string reason_;
  bool ended_ = false;
};

}  // namespace ferrox::indexd
