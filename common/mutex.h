#pragma once

#include <pthread.h>

#include "base/thread_annotations.h"
#include "common/export.h"

namespace ferrox {

/// A plain POSIX mutex: not recursive, not checked. Each call returns whether the system's call succeeded. Lock blocks
/// until the mutex is free; TryLock does not block and is false when it is not. Unlock only on the thread that holds
/// it. What it guards can be declared with the annotations of base/thread_annotations.h.
class FERROX_EXPORT BASE_CAPABILITY("mutex") Mutex {
 public:
  Mutex();
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;
  ~Mutex();

  bool Lock() BASE_ACQUIRE();
  bool TryLock() BASE_TRY_ACQUIRE(true);
  bool Unlock() BASE_RELEASE();

 private:
  pthread_mutex_t mutex_ = {};
};

/// Holds a Mutex while it lives; the mutex must outlive it. Its constructor blocks until the mutex is free.
class FERROX_EXPORT BASE_SCOPED_CAPABILITY LockMutex {
 public:
  explicit LockMutex(Mutex& mutex) BASE_ACQUIRE(mutex) : mutex_(mutex) { (void)mutex_.Lock(); }
  LockMutex(const LockMutex&) = delete;
  LockMutex& operator=(const LockMutex&) = delete;
  ~LockMutex() BASE_RELEASE() { (void)mutex_.Unlock(); }

 private:
  Mutex& mutex_;
};

}  // namespace ferrox
