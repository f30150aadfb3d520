#pragma once

#include <cstddef>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <thread>

#include "base/mutex.h"
#include "services/support/frame_connection.h"

namespace ferrox::services {

/// Where new connections of bound users wait until a thread of low priority has admitted them. However many of them
/// come and are ended again, at the priority of the others that costs no more than their accepting. The user of whom
/// the fewest wait is admitted first.
class Reception {
 public:
  using Admit = std::function<void(std::unique_ptr<FrameConnection>)>;

  /// `admit` is called by the thread, which lives as long as this does.
  Reception(size_t waiting_max, Admit admit);
  Reception(const Reception&) = delete;
  Reception& operator=(const Reception&) = delete;
  /// Ends those that wait.
  ~Reception();

  /// Whether everybody who came has been admitted or ended.
  bool IsEmpty();
  /// When too many wait, one of the user of whom the most do is ended. Any thread may call.
  void Take(std::unique_ptr<FrameConnection> newcomer);

 private:
  using Queue = std::deque<std::unique_ptr<FrameConnection>>;
  using Queues = std::map<uid_t, Queue>;

  void ThreadMain();
  /// The one that has waited for the longest time. The queue is not empty.
  std::unique_ptr<FrameConnection> PopFrom(Queues::iterator queue) BASE_REQUIRES(mutex_);

  const size_t waiting_max_;
  const Admit admit_;
  base::Mutex mutex_;
  base::ConditionVariable wake_thread_;
  Queues queues_ BASE_GUARDED_BY(mutex_);  ///< of users of whom any wait
  size_t waiting_ BASE_GUARDED_BY(mutex_) = 0;
  bool is_admitting_ BASE_GUARDED_BY(mutex_) = false;
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  std::thread thread_;
};

}  // namespace ferrox::services
