#pragma once

#include <chrono>
#include <exception>

#include "base/mutex.h"
#include "common/clock.h"
#include "wire/cancellation.h"

namespace ferrox::indexd {

/// Thrown where work stops because of a pause or of the daemon's end. Not an Error: nothing failed.
class Interrupted : public std::exception {
 public:
  const char* what() const noexcept override { return "interrupted"; }
};

/// Asks work in other threads to stop soon: a request that the work finds at its next Check or sleep, and that can be
/// taken back; and, for a worker that ends for good, a cut of what it waits for from other daemons. Any thread may call
/// any of its functions.
class Interruption {
 public:
  void Request();
  void Clear();
  bool Requested() const;
  /// @throws Interrupted when it was requested.
  void Check() const;
  /// Sleeps, at most until it is requested. @throws Interrupted then.
  void SleepFor(std::chrono::milliseconds duration) const;

  /// Ends the waits for other daemons, too, now and from now on: one of them may never answer.
  void CutWaits() { waits_.Cancel(); }

 private:
  friend class InterruptionScope;

  mutable base::Mutex mutex_;
  mutable base::ConditionVariable changed_;
  bool requested_ BASE_GUARDED_BY(mutex_) = false;
  wire::Cancellation waits_;
};

/// Makes an interruption the calling thread's while it lives: the process's InterruptibleClock then wakes that thread
/// from any sleep, also deep in the library, where a busy or absent engine is waited for; and what it asks of other
/// daemons can be cut.
class InterruptionScope {
 public:
  explicit InterruptionScope(const Interruption& interruption);
  InterruptionScope(const InterruptionScope&) = delete;
  InterruptionScope& operator=(const InterruptionScope&) = delete;
  ~InterruptionScope();

 private:
  const Interruption* before_;
  wire::CancellationScope waits_;
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
