#pragma once

#include <atomic>
#include <deque>
#include <exception>
#include <functional>
#include <thread>
#include <vector>

#include "base/mutex.h"
#include "services/fileindexd/interruption.h"

namespace ferrox::indexd {

class TaskGroup;

/// The threads that read and write files for all shares. They carry out the tasks of several groups, in the order in
/// which they were submitted, but urgent ones first; two threads more than asked for make sure that an urgent task
/// never waits for others to end.
class TaskPool {
 public:
  /// `threads` for tasks that are not urgent, at least two, so that one slow file does not hold up the others.
  explicit TaskPool(unsigned threads);
  TaskPool(const TaskPool&) = delete;
  TaskPool& operator=(const TaskPool&) = delete;
  /// Every group must be gone by then.
  ~TaskPool();

  /// How many tasks that are not urgent run at once.
  unsigned Threads() const { return normal_max_; }

 private:
  friend class TaskGroup;
  struct Job {
    TaskGroup* group = nullptr;
    bool urgent = false;
    std::function<void()> task;
  };
  void Add(Job job);
  /// Takes those of the group's tasks that have not begun out of the pool; for the group they end as interrupted.
  void Drop(TaskGroup& group);
  bool HasJob() const BASE_REQUIRES(mutex_);
  Job Take() BASE_REQUIRES(mutex_);
  void Work();
  static void Run(Job& job);

  const unsigned normal_max_;
  base::Mutex mutex_;
  base::ConditionVariable job_ready_;
  std::deque<Job> urgent_ BASE_GUARDED_BY(mutex_);
  std::deque<Job> normal_ BASE_GUARDED_BY(mutex_);
  unsigned normal_running_ BASE_GUARDED_BY(mutex_) = 0;
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  std::vector<std::thread> threads_;
};

/// Tasks that belong together, submitted by one thread. The first that throws cancels those that have not begun; its
/// exception comes out of the next Submit or Wait. Tasks run under the group's interruption (InterruptionScope).
class TaskGroup {
 public:
  /// Both outlive the group.
  TaskGroup(TaskPool& pool, const Interruption& interruption) : pool_(pool), interruption_(interruption) {}
  TaskGroup(const TaskGroup&) = delete;
  TaskGroup& operator=(const TaskGroup&) = delete;
  /// Waits for the tasks that have begun; drops the others.
  ~TaskGroup();

  /// For the tasks submitted from now on.
  void SetUrgent(bool urgent) { urgent_ = urgent; }
  /// Queues a task; blocks while the group has eight unfinished tasks for each thread, which bounds what waits in
  /// memory. @throws what a task threw, once all have ended; Interrupted.
  void Submit(std::function<void()> task);
  /// Waits for all tasks. @throws likewise.
  void Wait();

 private:
  friend class TaskPool;
  void AwaitAtMost(size_t unfinished, bool until_failure) BASE_REQUIRES(mutex_);
  void Finish(std::exception_ptr failure);
  void RethrowFailure() BASE_REQUIRES(mutex_);

  TaskPool& pool_;
  const Interruption& interruption_;
  bool urgent_ = false;  ///< the submitting thread's
  base::Mutex mutex_;
  base::ConditionVariable finished_;
  size_t unfinished_ BASE_GUARDED_BY(mutex_) = 0;
  std::exception_ptr failure_ BASE_GUARDED_BY(mutex_);  ///< the first
  std::atomic<bool> cancelled_{false};                  ///< tasks that have not begun are not to begin
};

}  // namespace ferrox::indexd
