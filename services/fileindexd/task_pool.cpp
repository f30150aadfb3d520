#include "services/fileindexd/task_pool.h"

#include <algorithm>
#include <utility>

namespace ferrox::indexd {

namespace {

constexpr size_t kWaitingPerThread = 8;
constexpr unsigned kThreadsForUrgent = 2;

}  // namespace

TaskPool::TaskPool(unsigned threads) : unhurried_max_(std::max(threads, 2U)) {
  for (unsigned i = 0; i < unhurried_max_ + kThreadsForUrgent; ++i) threads_.emplace_back([this] { Work(); });
}

TaskPool::~TaskPool() {
  {
    const std::lock_guard lock(mutex_);
    stopping_ = true;
  }
  job_ready_.notify_all();
  for (std::thread& thread : threads_) thread.join();
}

void TaskPool::Add(Job job) {
  {
    const std::lock_guard lock(mutex_);
    (job.urgent ? urgent_ : unhurried_).push_back(std::move(job));
  }
  job_ready_.notify_one();
}

TaskPool::Job TaskPool::Take() {
  std::deque<Job>& jobs = urgent_.empty() ? unhurried_ : urgent_;
  Job job = std::move(jobs.front());
  jobs.pop_front();
  unhurried_running_ += job.urgent ? 0 : 1;
  return job;
}

void TaskPool::Work() {
  std::unique_lock lock(mutex_);
  while (true) {
    job_ready_.wait(lock, [this] { return stopping_ || HasJob(); });
    if (!HasJob()) return;
    Job job = Take();
    lock.unlock();
    Run(job);
    lock.lock();
    unhurried_running_ -= job.urgent ? 0 : 1;
  }
}

void TaskPool::Run(Job& job) {
  std::exception_ptr failure;
  try {
    const InterruptionScope scope(job.group->interruption_);
    job.group->interruption_.Check();
    if (!job.group->voided_.load()) job.task();
  } catch (...) {
    failure = std::current_exception();
  }
  job.task = nullptr;
  // Given away, so that the thread that waits for it is the one that frees it: the thread sanitizer cannot see more.
  job.group->Finish(std::move(failure));
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
  pool_.Add({this, urgent_, std::move(task)});
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
