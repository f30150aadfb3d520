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

/// A fixed number of threads that carry out the tasks of several groups.
class TaskPool {
 public:
  /// At least two threads, so that one slow file does not hold up the others.
  explicit TaskPool(unsigned threads);
  TaskPool(const TaskPool&) = delete;
  TaskPool& operator=(const TaskPool&) = delete;
  /// Every group must be gone by then.
  ~TaskPool();

  unsigned Threads() const { return static_cast<unsigned>(threads_.size()); }

 private:
  friend class TaskGroup;
  struct Job {
    TaskGroup* group;
    std::function<void()> task;
  };
  void Work();

  std::mutex mutex_;
  std::condition_variable job_ready_;
  std::deque<Job> jobs_;
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

  /// Queues a task; waits while several tasks a thread wait already. @throws what a task threw; Interrupted.
  void Submit(std::function<void()> task);
  /// Waits for all tasks. @throws likewise.
  void Wait();

 private:
  friend class TaskPool;
  void Finish(std::exception_ptr failure);
  void RethrowFailure(std::unique_lock<std::mutex>& lock);

  TaskPool& pool_;
  const Interruption& interruption_;
  std::mutex mutex_;
  std::condition_variable done_;
  size_t unfinished_ = 0;
  std::exception_ptr failure_;
  std::atomic<bool> voided_{false};
};

}  // namespace ferrox::indexd
