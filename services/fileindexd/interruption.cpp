#include "services/fileindexd/interruption.h"

namespace ferrox::indexd {

namespace {

thread_local const Interruption* t_interruption = nullptr;

}  // namespace

void Interruption::Request() {
  const base::MutexLock lock(mutex_);
  requested_ = true;
  changed_.NotifyAll();
}

void Interruption::Clear() {
  const base::MutexLock lock(mutex_);
  requested_ = false;
}

bool Interruption::Requested() const {
  const base::MutexLock lock(mutex_);
  return requested_;
}

void Interruption::Check() const {
  if (Requested()) throw Interrupted();
}

void Interruption::SleepFor(std::chrono::milliseconds duration) const {
  const auto end = std::chrono::steady_clock::now() + duration;
  const base::MutexLock lock(mutex_);
  while (!requested_) {
    if (!changed_.WaitUntil(mutex_, end)) break;
  }
  if (requested_) throw Interrupted();
}

InterruptionScope::InterruptionScope(const Interruption& interruption)
    : before_(t_interruption), waits_(interruption.waits_) {
  t_interruption = &interruption;
}

InterruptionScope::~InterruptionScope() { t_interruption = before_; }

void InterruptibleClock::SleepFor(std::chrono::milliseconds duration) {
  if (t_interruption == nullptr) return Clock::SleepFor(duration);
  t_interruption->SleepFor(duration);
}

}  // namespace ferrox::indexd
