#include "services/kovaelasticd/commands/fresh_rounds.h"

#include <exception>
#include <utility>

#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

FreshRounds::~FreshRounds() {
  End();
  std::thread thread;
  {
    const base::MutexLock lock(mutex_);
    thread = std::move(thread_);
  }
  if (thread.joinable()) thread.join();
}

void FreshRounds::End() {
  cancellation_.Cancel();
  const base::MutexLock lock(mutex_);
  stopping_ = true;
  wake_thread_.NotifyOne();
  wake_callers_.NotifyAll();
}

FreshRounds::Answer FreshRounds::Await(uint32_t uid, std::chrono::steady_clock::time_point end) {
  const base::MutexLock lock(mutex_);
  if (waiting_.count(uid) != 0) {
    throw UserError(Error::kEngineUserBusy, "another request of yours waits for changes already");
  }
  if (waiting_.size() >= kWaitersMax) {
    throw UserError(Error::kEngineUserBusy, "too many wait for changes already; ask again");
  }
  if (!stopping_ && !thread_.joinable()) thread_ = std::thread(&FreshRounds::RunRounds, this);
  waiting_.insert(uid);
  const uint64_t wanted = wanted_ = begun_ + 1;
  wake_thread_.NotifyOne();
  while (!stopping_ && ended_ < wanted && wake_callers_.WaitUntil(mutex_, end)) {
  }
  waiting_.erase(uid);
  return ended_ < wanted ? Answer() : Answer{true, last_};
}

/// A round that began later than the one that a caller waits for has covered that call, too.
void FreshRounds::RunRounds() {
  const wire::CancellationScope scope(cancellation_);
  base::MutexLock lock(mutex_);
  for (;;) {
    while (!stopping_ && begun_ == wanted_) wake_thread_.Wait(mutex_);
    if (stopping_) return;
    ++begun_;
    lock.Unlock();
    Outcome outcome;
    try {
      outcome = ask_();
    } catch (const std::exception&) {
      outcome.reset();  // short of memory
    }
    lock.Lock();
    last_ = std::move(outcome);
    ended_ = begun_;
    wake_callers_.NotifyAll();
  }
}

}  // namespace ferrox::engine
