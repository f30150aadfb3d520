#pragma once

#include <chrono>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <set>

#include "common/clock.h"
#include "platform/shared/frames.h"

namespace ferrox::indexd {

/// Thrown where work stops because of a pause or of the daemon's end. Not an Error: nothing failed.
class Interrupted : public std::exception {
 public:
  const char* what() const noexcept override { return "interrupted"; }
};

/// Asks work in other threads to stop soon.
class Interruption : public kova::SocketWaits {
 public:
  void Request();
  void Clear();
  /// Ends the waits for other daemons, too, now and from now on: one of them may never answer.
  void CutWaits();
  bool Requested() const;
  /// @throws Interrupted when it was requested.
  void Check() const;
  /// Sleeps, at most until it is requested. @throws Interrupted then.
  void SleepFor(std::chrono::milliseconds duration) const;

 private:
  void Begin(int fd) const override;
  void End(int fd) const override;

  mutable std::mutex mutex_;
  mutable std::condition_variable changed_;
  mutable std::set<int> sockets_;  ///< on which threads wait
  bool requested_ = false;
  bool cuts_ = false;
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
  const kova::SocketWaits* waits_before_;
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
