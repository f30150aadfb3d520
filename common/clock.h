#pragma once

#include <chrono>
#include <cstdint>

#include "common/export.h"

namespace ferrox {

/// Time and sleep, so that a test can own both. One per process, replaced only by tests.
class FERROX_EXPORT Clock {
 public:
  Clock() = default;
  Clock(const Clock&) = delete;
  Clock& operator=(const Clock&) = delete;
  virtual ~Clock();

  virtual void SleepFor(std::chrono::milliseconds duration);
  /// Seconds since the epoch.
  virtual int64_t Now();

  static Clock& Get();
  /// Makes `clock` the process's and returns the one before; null restores the real one. The caller keeps `clock`
  /// alive.
  static Clock* Set(Clock* clock);
};

}  // namespace ferrox
