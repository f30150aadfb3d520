#include "services/fileindexd/interruption.h"

#include <sys/socket.h>

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

void Interruption::CutWaits() {
  const std::lock_guard lock(mutex_);
  cuts_ = true;
  for (const int fd : sockets_) (void)shutdown(fd, SHUT_RDWR);
}

void Interruption::Begin(int fd) const {
  const std::lock_guard lock(mutex_);
  sockets_.insert(fd);
  if (cuts_) (void)shutdown(fd, SHUT_RDWR);
}

void Interruption::End(int fd) const {
  const std::lock_guard lock(mutex_);
  sockets_.erase(fd);
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

InterruptionScope::InterruptionScope(const Interruption& interruption)
    : before_(t_interruption), waits_before_(kova::SetSocketWaits(&interruption)) {
  t_interruption = &interruption;
}

InterruptionScope::~InterruptionScope() {
  t_interruption = before_;
  (void)kova::SetSocketWaits(waits_before_);
}

void InterruptibleClock::SleepFor(std::chrono::milliseconds duration) {
  if (t_interruption == nullptr) return Clock::SleepFor(duration);
  t_interruption->SleepFor(duration);
}

}  // namespace ferrox::indexd
