#pragma once

#include <chrono>
#include <exception>
#include <functional>
#include <thread>

#include "base/mutex.h"
#include "services/fileindexd/interruption.h"

namespace ferrox::indexd {

/// Does something again and again in a thread of its own, with a pause before each time that is at least as long as the
/// last time took: so it takes at most half of the time of whoever works beside it. Belongs to one thread.
class RepeatingThread {
 public:
  /// One time; false ends the thread.
  using Step = std::function<bool()>;

  /// The thread runs under `interruption`, which outlives it; the pauses are of at least `interval`, the first one of
  /// `first`.
  RepeatingThread(const Interruption& interruption, std::chrono::milliseconds interval, std::chrono::milliseconds first)
      : interruption_(interruption), interval_(interval), first_(first) {}
  RepeatingThread(const RepeatingThread&) = delete;
  RepeatingThread& operator=(const RepeatingThread&) = delete;
  ~RepeatingThread() { Stop(); }

  /// Once.
  void Start(Step step);
  /// Ends the thread after the step under way. May be called again, and without a Start.
  void Stop();
  /// @throws what a step threw, which has ended the thread. From any thread.
  void ThrowIfFailed();

 private:
  void Run(const Step& step);
  bool Pause(std::chrono::steady_clock::duration last_took);

  const Interruption& interruption_;
  const std::chrono::milliseconds interval_;
  const std::chrono::milliseconds first_;
  base::Mutex mutex_;
  base::ConditionVariable stop_changed_;
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  std::exception_ptr failure_ BASE_GUARDED_BY(mutex_);
  std::thread thread_;
};

}  // namespace ferrox::indexd
