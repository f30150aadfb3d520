#pragma once

#include <chrono>
#include <cstdint>

#include "common/export.h"

namespace ferrox {

constexpr int64_t kDaySec = 86400;  ///< a day, in the unit of Clock::Now

/// Time and sleep. All of the library asks the process's one clock, so that a test can decide what time it is and what
/// a wait costs, and a daemon can make waits end early. Its functions are called by several threads at once; a
/// replacement must be ready for that.
///   MyClock clock;
///   ferrox::Clock* before = ferrox::Clock::Set(&clock);
///   ...
///   ferrox::Clock::Set(before);  // before `clock` ends
class FERROX_EXPORT Clock {
 public:
  Clock() = default;
  Clock(const Clock&) = delete;
  Clock& operator=(const Clock&) = delete;
  virtual ~Clock();

  /// Blocks the calling thread for `duration`. A replacement may throw to end the work that waits. The real one is not
  /// cut short by signals, and returns at once for 0 or less.
  virtual void SleepFor(std::chrono::milliseconds duration);
  /// Seconds since the epoch, by the host's clock: may jump when that is set.
  virtual int64_t Now();

  /// The present clock. The reference must not be kept over a Set.
  static Clock& Get();
  /// Makes `clock` the process's and returns the one before; null restores the real one. The caller keeps `clock`
  /// alive.
  static Clock* Set(Clock* clock);
};

}  // namespace ferrox
