#include "services/fileindexd/repeating_thread.h"

#include <algorithm>
#include <utility>

namespace ferrox::indexd {

using std::chrono::steady_clock;

void RepeatingThread::Start(Step step) {
  thread_ = std::thread([this, step = std::move(step)] { Run(step); });
}

void RepeatingThread::Stop() {
  {
    const base::MutexLock lock(mutex_);
    stopping_ = true;
  }
  stop_changed_.NotifyAll();
  if (thread_.joinable()) thread_.join();
}

void RepeatingThread::ThrowIfFailed() {
  const base::MutexLock lock(mutex_);
  if (failure_) std::rethrow_exception(failure_);
}

void RepeatingThread::Run(const Step& step) {
  const InterruptionScope scope(interruption_);
  try {
    steady_clock::duration took = first_;
    for (bool is_more = true; is_more && Pause(took);) {
      const auto begin = steady_clock::now();
      is_more = step();
      took = steady_clock::now() - begin;
    }
  } catch (...) {
    const base::MutexLock lock(mutex_);
    failure_ = std::current_exception();
  }
}

/// @return false when the thread is to end.
bool RepeatingThread::Pause(steady_clock::duration last_took) {
  const auto end = steady_clock::now() + std::max<steady_clock::duration>(interval_, last_took);
  const base::MutexLock lock(mutex_);
  while (!stopping_ && steady_clock::now() < end) (void)stop_changed_.WaitUntil(mutex_, end);
  return !stopping_;
}

}  // namespace ferrox::indexd
