#include "services/kovawebd/work_threads.h"

#include <utility>

namespace ferrox::web {

WorkThreads::WorkThreads(unsigned threads, size_t waiting_max) : waiting_max_(waiting_max) {
  for (unsigned i = 0; i < threads; ++i) threads_.emplace_back([this] { Run(); });
}

void WorkThreads::End() {
  {
    const base::MutexLock lock(mutex_);
    ends_ = true;
  }
  changed_.NotifyAll();
  for (std::thread& thread : threads_) thread.join();
  threads_.clear();
}

bool WorkThreads::Give(std::function<void()> work) {
  {
    const base::MutexLock lock(mutex_);
    if (ends_ || waiting_.size() >= waiting_max_) return false;
    waiting_.push_back(std::move(work));
  }
  changed_.NotifyOne();
  return true;
}

void WorkThreads::Run() {
  base::MutexLock lock(mutex_);
  for (;;) {
    while (waiting_.empty() && !ends_) changed_.Wait(mutex_);
    if (waiting_.empty()) return;
    const std::function<void()> work = std::move(waiting_.front());
    waiting_.pop_front();
    lock.Unlock();
    work();
    lock.Lock();
  }
}

}  // namespace ferrox::web
