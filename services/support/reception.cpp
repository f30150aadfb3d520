#include "services/support/reception.h"

#include <algorithm>
#include <utility>

#include "base/priority.h"

namespace ferrox::services {

namespace {

/// By how many of a user wait.
constexpr auto kIsShorter = [](const auto& a, const auto& b) { return a.second.size() < b.second.size(); };

}  // namespace

Reception::Reception(size_t waiting_max, Admit admit)
    : waiting_max_(waiting_max), admit_(std::move(admit)), thread_([this] { ThreadMain(); }) {}

Reception::~Reception() {
  {
    const base::MutexLock lock(mutex_);
    stopping_ = true;
    wake_thread_.NotifyOne();
  }
  thread_.join();
}

bool Reception::IsEmpty() {
  const base::MutexLock lock(mutex_);
  return waiting_ == 0 && !is_admitting_;
}

void Reception::Take(std::unique_ptr<FrameConnection> newcomer) {
  std::unique_ptr<FrameConnection> ended;
  const base::MutexLock lock(mutex_);
  if (waiting_ >= waiting_max_) {
    ended = PopFrom(std::max_element(queues_.begin(), queues_.end(), kIsShorter));
  }
  Queue& own = queues_[newcomer->peer.uid];
  own.push_back(std::move(newcomer));
  ++waiting_;
  wake_thread_.NotifyOne();
}

void Reception::ThreadMain() {
  (void)base::StandBehindOthers();
  base::MutexLock lock(mutex_);
  while (!stopping_) {
    if (queues_.empty()) {
      wake_thread_.Wait(mutex_);
      continue;
    }
    std::unique_ptr<FrameConnection> next = PopFrom(std::min_element(queues_.begin(), queues_.end(), kIsShorter));
    is_admitting_ = true;
    lock.Unlock();
    admit_(std::move(next));
    lock.Lock();
    is_admitting_ = false;
  }
}

std::unique_ptr<FrameConnection> Reception::PopFrom(Queues::iterator queue) {
  std::unique_ptr<FrameConnection> oldest = std::move(queue->second.front());
  queue->second.pop_front();
  if (queue->second.empty()) queues_.erase(queue);
  --waiting_;
  return oldest;
}

}  // namespace ferrox::services
