#include "services/fileindexd/interruption.h"

namespace ferrox::indexd {

namespace {

thread_local const Interruption* t_interruption = nullptr;

}  // namespace

void Interruption::Request() {
  const std::lock_guard lock(mutex_);
  requested_ = true;
  changed_.notify_all();
}

void Interruption::Clear() {
  const std::lock_guard lock(mutex_);
  requested_ = false;
}

bool Interruption::Requested() const {
  const std::lock_guard lock(mutex_);
  return requested_;
}

void Interruption::Check() const {
  if (Requested()) throw Interrupted();
}

void Interruption::SleepFor(std::chrono::milliseconds duration) const {
  std::unique_lock lock(mutex_);
  if (changed_.wait_for(lock, duration, [this] { return requested_; })) throw Interrupted();
}

InterruptionScope::InterruptionScope(const Interruption& interruption) : before_(t_interruption) {
  t_interruption = &interruption;
}

InterruptionScope::~InterruptionScope() { t_interruption = before_; }

void InterruptibleClock::SleepFor(std::chrono::milliseconds duration) {
  if (t_interruption == nullptr) return Clock::SleepFor(duration);
  t_interruption->SleepFor(duration);
}

}  // namespace ferrox::indexd
