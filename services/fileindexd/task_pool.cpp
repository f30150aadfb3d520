#include "services/fileindexd/task_pool.h"

#include <algorithm>
#include <chrono>
#include <utility>

namespace ferrox::indexd {

namespace {

constexpr size_t kWaitingPerThread = 8;
constexpr unsigned kThreadsForUrgent = 2;
constexpr std::chrono::milliseconds kLookForInterruption{100};

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

void TaskPool::Drop(TaskGroup& group) {
  size_t dropped = 0;
  {
    const std::lock_guard lock(mutex_);
    const auto is_its = [&group](const Job& job) { return job.group == &group; };
    dropped = std::erase_if(urgent_, is_its) + std::erase_if(unhurried_, is_its);
  }
  for (; dropped > 0; --dropped) group.Finish(std::make_exception_ptr(Interrupted()));
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
  Await(lock, [this] { return unfinished_ == 0; });
}

template <typename IsOver>
void TaskGroup::Await(std::unique_lock<std::mutex>& lock, const IsOver& is_over) {
  while (!done_.wait_for(lock, kLookForInterruption, is_over)) {
    if (!voided_ && !interruption_.Requested()) continue;
    lock.unlock();
    pool_.Drop(*this);
    lock.lock();
  }
}

void TaskGroup::Submit(std::function<void()> task) {
  interruption_.Check();
  {
    std::unique_lock lock(mutex_);
    Await(lock, [this] { return unfinished_ < kWaitingPerThread * pool_.Threads() || failure_; });
    RethrowFailure(lock);
    ++unfinished_;
  }
  pool_.Add({this, urgent_, std::move(task)});
}

void TaskGroup::Wait() {
  std::unique_lock lock(mutex_);
  Await(lock, [this] { return unfinished_ == 0; });
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
  Await(lock, [this] { return unfinished_ == 0; });
  std::rethrow_exception(failure_);
}

}  // namespace ferrox::indexd
