#pragma once

#include <atomic>
#include <vector>

#include "common/clock.h"

namespace ferrox::test {

/// Time that passes only by sleeping; records each sleep. The process's clock while it lives.
class FakeClock : public Clock {
 public:
  FakeClock() { before_ = Clock::Set(this); }
  ~FakeClock() override { (void)Clock::Set(before_); }

  void SleepFor(std::chrono::milliseconds duration) override {
    sleeps.push_back(duration);
    now_ms += duration.count();
    if (on_sleep) on_sleep();
  }
  int64_t Now() override { return now_ms / 1000; }

  std::vector<std::chrono::milliseconds> sleeps;
  std::atomic<int64_t> now_ms{1700000000000};
  void (*on_sleep)() = nullptr;

 private:
  Clock* before_;
};

}  // namespace ferrox::test
