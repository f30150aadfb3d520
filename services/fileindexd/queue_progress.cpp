#include "services/fileindexd/queue_progress.h"

#include <algorithm>

namespace ferrox::indexd {

uint64_t QueueProgress::Add() {
  const base::MutexLock lock(mutex_);
  return ++last_;
}

uint64_t QueueProgress::Last() const {
  const base::MutexLock lock(mutex_);
  return last_;
}

bool QueueProgress::HasPending() const {
  const base::MutexLock lock(mutex_);
  return last_ > std::max(done_, failed_);
}

void QueueProgress::Done(uint64_t request) {
  const base::MutexLock lock(mutex_);
  done_ = std::max(done_, request);
  changed_.NotifyAll();
}

void QueueProgress::Failed(uint64_t request, const std::string& reason) {
  const base::MutexLock lock(mutex_);
  failed_ = std::max(failed_, request);
  reason_ = reason;
  changed_.NotifyAll();
}

void QueueProgress::End(const std::string& reason) {
  const base::MutexLock lock(mutex_);
  ended_ = true;
  reason_ = reason;
  changed_.NotifyAll();
}

bool QueueProgress::IsDecided(uint64_t request) const { return ended_ || request <= std::max(done_, failed_); }

QueueProgress::Result QueueProgress::Wait(uint64_t request, TimePoint end, std::string& reason) {
  const base::MutexLock lock(mutex_);
  while (!IsDecided(request)) {
    if (!changed_.WaitUntil(mutex_, end) && !IsDecided(request)) return Result::kTimeout;
  }
  if (request <= done_) return Result::kDone;
  reason = reason_;
  return Result::kFailed;
}

}  // namespace ferrox::indexd
