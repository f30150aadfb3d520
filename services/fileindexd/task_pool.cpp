#include "services/fileindexd/task_pool.h"

#include <algorithm>
#include <utility>

namespace ferrox::indexd {

namespace {

constexpr size_t kWaitingPerThread = 8;

}  // namespace

TaskPool::TaskPool(unsigned threads) {
  for (unsigned i = 0; i < std::max(threads, 2U); ++i) threads_.emplace_back([this] { Work(); });
}

TaskPool::~TaskPool() {
  {
    const std::lock_guard lock(mutex_);
    stopping_ = true;
  }
  job_ready_.notify_all();
  for (std::thread& thread : threads_) thread.join();
}

void TaskPool::Work() {
  while (true) {
    Job job;
    {
      std::unique_lock lock(mutex_);
      job_ready_.wait(lock, [this] { return stopping_ || !jobs_.empty(); });
      if (jobs_.empty()) return;
      job = std::move(jobs_.front());
      jobs_.pop_front();
    }
    std::exception_ptr failure;
    try {
      const InterruptionScope scope(job.group->interruption_);
      job.group->interruption_.Check();
      if (!job.group->voided_.load()) job.task();
    } catch (...) {
      failure = std::current_exception();
    }
    job.task = nullptr;
    job.group->Finish(std::move(failure));
  }
}

TaskGroup::~TaskGroup() {
  voided_ = true;
  std::unique_lock lock(mutex_);
  done_.wait(lock, [this] { return unfinished_ == 0; });
}

void TaskGroup::Submit(std::function<void()> task) {
  interruption_.Check();
  {
    std::unique_lock lock(mutex_);
    done_.wait(lock, [this] { return unfinished_ < kWaitingPerThread * pool_.Threads() || failure_; });
    RethrowFailure(lock);
    ++unfinished_;
  }
  {
    const std::lock_guard lock(pool_.mutex_);
    pool_.jobs_.push_back({this, std::move(task)});
  }
  pool_.job_ready_.notify_one();
}

void TaskGroup::Wait() {
  std::unique_lock lock(mutex_);
  done_.wait(lock, [this] { return unfinished_ == 0; });
  RethrowFailure(lock);
}

void TaskGroup::Finish(std::exception_ptr failure) {
  const std::lock_guard lock(mutex_);
  if (failure && !failure_) {
    failure_ = std::move(failure);
    voided_ = true;
  }
  --unfinished_;
  // Under the lock: the group may be gone as soon as its owner can see that nothing is left.
  done_.notify_all();
}

void TaskGroup::RethrowFailure(std::unique_lock<std::mutex>& lock) {
  if (!failure_) return;
  done_.wait(lock, [this] { return unfinished_ == 0; });
  std::rethrow_exception(failure_);
}

}  // namespace ferrox::indexd
