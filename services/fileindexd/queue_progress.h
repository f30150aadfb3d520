#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include "base/mutex.h"

namespace ferrox::indexd {

/// Requests to have in the index what is queued now (the "sync" command), and how far a share's worker is with them.
/// Requests are numbered upwards from 1, and an outcome counts for its request and all before it. Every call is safe
/// from any thread; only Wait blocks.
class QueueProgress {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  /// Makes a request. @return its number.
  uint64_t Add();
  /// The last request made: work that begins after this call serves all requests up to it.
  uint64_t Last() const;
  /// Whether a request has no outcome yet.
  bool HasPending() const;

  /// What was queued at the request is in the index.
  void Done(uint64_t request);
  /// The work for the request cannot be done now. A later Done counts again.
  void Failed(uint64_t request, const std::string& reason);
  /// The worker ends: every wait, also those to come, fails with the reason unless its request is done.
  void End(const std::string& reason);

  enum class Result { kDone, kFailed, kTimeout };
  /// Waits for the outcome of a request, at most until `end`. `reason` is filled when it failed.
  Result Wait(uint64_t request, TimePoint end, std::string& reason);

 private:
  bool IsDecided(uint64_t request) const BASE_REQUIRES(mutex_);

  mutable base::Mutex mutex_;
  base::ConditionVariable changed_;
  uint64_t last_ BASE_GUARDED_BY(mutex_) = 0;
  uint64_t done_ BASE_GUARDED_BY(mutex_) = 0;
  uint64_t failed_ BASE_GUARDED_BY(mutex_) = 0;
  std::string reason_ BASE_GUARDED_BY(mutex_);  ///< of the last failure, or of the end
  bool ended_ BASE_GUARDED_BY(mutex_) = false;
};

}  // namespace ferrox::indexd
