#define FERROX_SOURCE "notifier"

#include "services/kovanotifyd/task_queue.h"

#include <sys/eventfd.h>
#include <unistd.h>

#include <cstdint>
#include <utility>

#include "common/log.h"

namespace ferrox::notifyd {

TaskQueue::TaskQueue() : wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  FERROX_FAIL_IF(!wake_.Valid(), Error::kInternal, "eventfd: " + ErrnoText());
}

bool TaskQueue::Post(Task task) {
  {
    const base::MutexLock lock(mutex_);
    if (is_closed_) return false;
    tasks_.push_back(std::move(task));
  }
  const uint64_t one = 1;
  (void)!write(wake_.Get(), &one, sizeof(one));
  return true;
}

void TaskQueue::RunAll() {
  uint64_t count = 0;
  if (read(wake_.Get(), &count, sizeof(count)) != sizeof(count)) return;
  std::vector<Task> tasks;
  {
    const base::MutexLock lock(mutex_);
    tasks.swap(tasks_);
  }
  for (const Task& task : tasks) task();
}

void TaskQueue::Close() {
  std::vector<Task> dropped;  // outlives the lock: what the tasks own is destroyed without it
  const base::MutexLock lock(mutex_);
  is_closed_ = true;
  dropped.swap(tasks_);
}

}  // namespace ferrox::notifyd
