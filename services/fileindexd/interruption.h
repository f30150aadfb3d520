#pragma once

#include <chrono>
#include <condition_variable>
#include <exception>
#include <mutex>

#include "common/clock.h"

namespace ferrox::indexd {

/// Thrown where work stops because of a pause or of the daemon's end. Not an Error: nothing failed.
class Interrupted : public std::exception {
 public:
  const char* what() const noexcept override { return "interrupted"; }
};

/// Asks work in other threads to stop soon.
class Interruption {
 public:
  void Request();
  void Clear();
  bool Requested() const;
  /// @throws Interrupted when it was requested.
  void Check() const;
  /// Sleeps, at most until it is requested. @throws Interrupted then.
  void SleepFor(std::chrono::milliseconds duration) const;

 private:
  mutable std::mutex mutex_;
  mutable std::condition_variable changed_;
  bool requested_ = false;
};

/// Makes an interruption the calling thread's while it lives: the process's InterruptibleClock then wakes that thread
/// from any sleep, also deep in the library, where a busy or absent engine is waited for.
class InterruptionScope {
 public:
  explicit InterruptionScope(const Interruption& interruption);
  InterruptionScope(const InterruptionScope&) = delete;
  InterruptionScope& operator=(const InterruptionScope&) = delete;
  ~InterruptionScope();

 private:
  const Interruption* before_;
};

/// The process's clock while it lives.
class InterruptibleClock : public Clock {
 public:
  InterruptibleClock() { before_ = Clock::Set(this); }
  ~InterruptibleClock() override { (void)Clock::Set(before_); }
  /// @throws Interrupted when the calling thread's interruption is requested.
  void SleepFor(std::chrono::milliseconds duration) override;

 private:
  Clock* before_;
};

}  // namespace ferrox::indexd
