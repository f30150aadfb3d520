#pragma once

#include <deque>
#include <functional>
#include <thread>
#include <vector>

#include "base/mutex.h"

namespace ferrox::web {

/// Threads that carry out what is given to them, in its order. Any thread may give.
class WorkThreads {
 public:
  WorkThreads(unsigned threads, size_t waiting_max);
  WorkThreads(const WorkThreads&) = delete;
  WorkThreads& operator=(const WorkThreads&) = delete;
  ~WorkThreads() { End(); }

  /// Carries out what was given, and nothing more; returns when that is done.
  void End();

  /// @param work throws nothing. @return false, with nothing done, when too much waits already, or after End.
  bool Give(std::function<void()> work);

 private:
  void Run();

  const size_t waiting_max_;
  base::Mutex mutex_;
  base::ConditionVariable changed_;
  std::deque<std::function<void()>> waiting_ BASE_GUARDED_BY(mutex_);
  bool ends_ BASE_GUARDED_BY(mutex_) = false;
  std::vector<std::thread> threads_;
};

}  // namespace ferrox::web
