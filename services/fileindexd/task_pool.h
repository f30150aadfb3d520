#pragma once

#include <atomic>
#include <condition_variable>
#include <deque>
#include <exception>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

#include "services/fileindexd/interruption.h"

namespace ferrox::indexd {

class TaskGroup;

/// A fixed number of threads that carry out the tasks of several groups. Urgent tasks go first, and two threads are
/// kept for them, so that they wait for no other that has begun.
class TaskPool {
 public:
  /// `threads` for tasks that are not urgent, at least two, so that one slow file does not hold up the others.
  explicit TaskPool(unsigned threads);
  TaskPool(const TaskPool&) = delete;
  TaskPool& operator=(const TaskPool&) = delete;
  /// Every group must be gone by then.
  ~TaskPool();

  /// Those for tasks that are not urgent.
  unsigned Threads() const { return unhurried_max_; }

 private:
  friend class TaskGroup;
  struct Job {
    TaskGroup* group = nullptr;
    bool urgent = false;
    std::function<void()> task;
  };
  void Add(Job job);
  /// Takes back those of the group's tasks that have not begun.
  void Drop(TaskGroup& group);
  bool HasJob() const { return !urgent_.empty() || (!unhurried_.empty() && unhurried_running_ < unhurried_max_); }
  Job Take();
  void Work();
  static void Run(Job& job);

  const unsigned unhurried_max_;
  std::mutex mutex_;
  std::condition_variable job_ready_;
  std::deque<Job> urgent_;
  std::deque<Job> unhurried_;
  unsigned unhurried_running_ = 0;
  bool stopping_ = false;
  std::vector<std::thread> threads_;
};

/// Tasks that belong together, submitted by one thread. The first that throws voids those not yet begun; what it threw
/// comes out of the next Submit or Wait.
class TaskGroup {
 public:
  TaskGroup(TaskPool& pool, const Interruption& interruption) : pool_(pool), interruption_(interruption) {}
  TaskGroup(const TaskGroup&) = delete;
  TaskGroup& operator=(const TaskGroup&) = delete;
  /// Waits for the tasks that have begun; drops the others.
  ~TaskGroup();

  /// Whether the tasks submitted from now on are.
  void SetUrgent(bool urgent) { urgent_ = urgent; }
  /// Queues a task; waits while several tasks a thread wait already. @throws what a task threw; Interrupted.
  void Submit(std::function<void()> task);
  /// Waits for all tasks. @throws likewise.
  void Wait();

 private:
  friend class TaskPool;
  /// Waits until `is_over` of the group; once it is interrupted or of no use any more, what has not begun is dropped:
  /// the threads may be held by another group's tasks.
  template <typename IsOver>
  void Await(std::unique_lock<std::mutex>& lock, const IsOver& is_over);
  void Finish(std::exception_ptr failure);
  void RethrowFailure(std::unique_lock<std::mutex>& lock);

  TaskPool& pool_;
  const Interruption& interruption_;
  bool urgent_ = false;
  std::mutex mutex_;
  std::condition_variable done_;
  size_t unfinished_ = 0;
  std::exception_ptr failure_;
  std::atomic<bool> voided_{false};
};

}  // namespace ferrox::indexd
