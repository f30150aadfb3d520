#include "services/fileindexd/task_pool.h"

#include <algorithm>
#include <chrono>
#include <utility>

namespace ferrox::indexd {

namespace {

using std::chrono::steady_clock;

constexpr size_t kUnfinishedPerThread = 8;
constexpr unsigned kThreadsForUrgent = 2;
/// An Interruption wakes sleeps and socket waits, but not those for a group's tasks: these check it at this interval.
constexpr std::chrono::milliseconds kInterruptionPoll{100};

}  // namespace

TaskPool::TaskPool(unsigned threads) : normal_max_(std::max(threads, 2U)) {
  for (unsigned i = 0; i < normal_max_ + kThreadsForUrgent; ++i) threads_.emplace_back([this] { Work(); });
}

TaskPool::~TaskPool() {
  {
    const base::MutexLock lock(mutex_);
    stopping_ = true;
  }
  job_ready_.NotifyAll();
  for (std::thread& thread : threads_) thread.join();
}

void TaskPool::Add(Job job) {
  {
    const base::MutexLock lock(mutex_);
    (job.urgent ? urgent_ : normal_).push_back(std::move(job));
  }
  job_ready_.NotifyOne();
}

void TaskPool::Drop(TaskGroup& group) {
  size_t dropped = 0;
  {
    const base::MutexLock lock(mutex_);
    const auto is_its = [&group](const Job& job) { return job.group == &group; };
    dropped = std::erase_if(urgent_, is_its) + std::erase_if(normal_, is_its);
  }
  for (; dropped > 0; --dropped) group.Finish(std::make_exception_ptr(Interrupted()));
}

bool TaskPool::HasJob() const { return !urgent_.empty() || (!normal_.empty() && normal_running_ < normal_max_); }

TaskPool::Job TaskPool::Take() {
  std::deque<Job>& jobs = urgent_.empty() ? normal_ : urgent_;
  Job job = std::move(jobs.front());
  jobs.pop_front();
  normal_running_ += job.urgent ? 0 : 1;
  return job;
}

void TaskPool::Work() {
  base::MutexLock lock(mutex_);
  while (true) {
    while (!stopping_ && !HasJob()) job_ready_.Wait(mutex_);
    if (!HasJob()) return;
    Job job = Take();
    lock.Unlock();
    Run(job);
    lock.Lock();
    normal_running_ -= job.urgent ? 0 : 1;
  }
}

void TaskPool::Run(Job& job) {
  std::exception_ptr failure;
  try {
    const InterruptionScope scope(job.group->interruption_);
    job.group->interruption_.Check();
    if (!job.group->cancelled_.load()) job.task();
  } catch (...) {
    failure = std::current_exception();
  }
  job.task = nullptr;
  // Moved, so that the thread that waits for the failure is the one that frees it: the thread sanitizer does not see
  // the reference count of exceptions.
  job.group->Finish(std::move(failure));
}

TaskGroup::~TaskGroup() {
  cancelled_ = true;
  const base::MutexLock lock(mutex_);
  AwaitAtMost(0, false);
}

/// Waits until no more tasks than these are unfinished, or, where asked for, one has failed. Once the group is
/// interrupted or cancelled, its tasks that have not begun are dropped: another group's tasks may hold the threads for
/// long.
void TaskGroup::AwaitAtMost(size_t unfinished, bool until_failure) {
  auto next_check = steady_clock::now() + kInterruptionPoll;
  while (unfinished_ > unfinished && !(until_failure && failure_)) {
    if (finished_.WaitUntil(mutex_, next_check)) continue;
    next_check = steady_clock::now() + kInterruptionPoll;
    if (!cancelled_ && !interruption_.Requested()) continue;
    mutex_.Unlock();
    pool_.Drop(*this);
    mutex_.Lock();
  }
}

void TaskGroup::Submit(std::function<void()> task) {
  interruption_.Check();
  {
    const base::MutexLock lock(mutex_);
    AwaitAtMost(kUnfinishedPerThread * pool_.Threads() - 1, true);
    RethrowFailure();
    ++unfinished_;
  }
  pool_.Add({this, urgent_, std::move(task)});
}

void TaskGroup::Wait() {
  const base::MutexLock lock(mutex_);
  AwaitAtMost(0, false);
  RethrowFailure();
}

void TaskGroup::Finish(std::exception_ptr failure) {
  const base::MutexLock lock(mutex_);
  if (failure && !failure_) {
    failure_ = std::move(failure);
    cancelled_ = true;
  }
  --unfinished_;
  // Under the lock: the owner may destroy the group as soon as it can see that nothing is unfinished.
  finished_.NotifyAll();
}

/// Not before the group's other tasks have ended: they use what the owner frees next.
void TaskGroup::RethrowFailure() {
  if (!failure_) return;
  AwaitAtMost(0, false);
  std::rethrow_exception(failure_);
}

}  // namespace ferrox::indexd
