#include "services/fileindexd/queue_progress.h"

#include <algorithm>

namespace ferrox::indexd {

uint64_t QueueProgress::Ask() {
  const std::lock_guard lock(mutex_);
  return ++asked_;
}

uint64_t QueueProgress::Asked() const {
  const std::lock_guard lock(mutex_);
  return asked_;
}

bool QueueProgress::IsAwaited() const {
  const std::lock_guard lock(mutex_);
  return asked_ > std::max(done_, failed_);
}

void QueueProgress::Done(uint64_t request) {
  const std::lock_guard lock(mutex_);
  done_ = std::max(done_, request);
  changed_.notify_all();
}

void QueueProgress::Failed(uint64_t request, const std::string& reason) {
  const std::lock_guard lock(mutex_);
  failed_ = std::max(failed_, request);
  reason_ = reason;
  changed_.notify_all();
}

void QueueProgress::End(const std::string& reason) {
  const std::lock_guard lock(mutex_);
  ended_ = true;
  reason_ = reason;
  changed_.notify_all();
}

QueueProgress::Result QueueProgress::Wait(uint64_t request, TimePoint end, std::string& reason) {
  std::unique_lock lock(mutex_);
  const auto decided = [this, request] { return ended_ || request <= std::max(done_, failed_); };
  if (!changed_.wait_until(lock, end, decided)) return Result::kTimeout;
  if (request <= done_) return Result::kDone;
  reason = reason_;
  return Result::kFailed;
}

}  // namespace ferrox::indexd
