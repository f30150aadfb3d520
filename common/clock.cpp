#include "common/clock.h"

#include <atomic>
#include <ctime>
#include <thread>

namespace ferrox {

namespace {

std::atomic<Clock*>& Current() {
  static Clock real;
  static std::atomic<Clock*> current{&real};
  return current;
}

Clock* const g_real = Current().load();

}  // namespace

Clock::~Clock() = default;
void Clock::SleepFor(std::chrono::milliseconds duration) { std::this_thread::sleep_for(duration); }
int64_t Clock::Now() { return static_cast<int64_t>(time(nullptr)); }

Clock& Clock::Get() { return *Current().load(); }
Clock* Clock::Set(Clock* clock) { return Current().exchange(clock != nullptr ? clock : g_real); }

}  // namespace ferrox
