#pragma once

#include <functional>
#include <vector>

#include "base/mutex.h"
#include "base/thread_annotations.h"
#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// Work that other threads hand to the thread of a loop. Post and Close may be called from any thread, the rest from
/// the loop's thread.
class TaskQueue {
 public:
  using Task = std::function<void()>;

  /// @throws Error kInternal when the kernel grants no descriptor.
  TaskQueue();

  /// Readable when RunAll has something to do.
  int Fd() const { return wake_.Get(); }
  /// Adds a task. False, and the task is dropped, after Close.
  bool Post(Task task) BASE_EXCLUDES(mutex_);
  /// Runs the tasks that were posted so far, in their order, without holding the mutex.
  void RunAll() BASE_EXCLUDES(mutex_);
  /// Drops the tasks that were not run, with what they own, and takes no others.
  void Close() BASE_EXCLUDES(mutex_);

 private:
  base::UniqueFd wake_;  ///< an eventfd, written to by Post
  base::Mutex mutex_;
  std::vector<Task> tasks_ BASE_GUARDED_BY(mutex_);
  bool is_closed_ BASE_GUARDED_BY(mutex_) = false;
};

}  // namespace ferrox::notifyd
