#pragma once

#include <pthread.h>

#include "common/export.h"

namespace ferrox {

/// A plain POSIX mutex: not recursive, not checked. Each call returns whether the system's call succeeded.
class FERROX_EXPORT Mutex {
 public:
  Mutex();
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;
  ~Mutex();

  bool Lock();
  bool TryLock();
  bool Unlock();

 private:
  pthread_mutex_t mutex_ = {};
};

/// Holds a Mutex while it lives.
class FERROX_EXPORT LockMutex {
 public:
  explicit LockMutex(Mutex& mutex) : mutex_(mutex) { (void)mutex_.Lock(); }
  LockMutex(const LockMutex&) = delete;
  LockMutex& operator=(const LockMutex&) = delete;
  ~LockMutex() { (void)mutex_.Unlock(); }

 private:
  Mutex& mutex_;
};

}  // namespace ferrox
