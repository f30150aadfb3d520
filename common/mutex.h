#pragma once

#include <pthread.h>

#include "base/thread_annotations.h"
#include "common/export.h"

namespace ferrox {

/// A plain POSIX mutex: not recursive, not checked. Each call returns whether the system's call succeeded. It works
/// between the threads of one process. A thread that locks it twice waits for itself for ever. Destroy it only when no
/// thread holds it or waits for it.
/// What it guards can be declared with the annotations of base/thread_annotations.h, which clang then checks:
///   ferrox::Mutex mutex_;
///   int count_ BASE_GUARDED_BY(mutex_) = 0;
///   void Add() { const ferrox::LockMutex guard(mutex_); ++count_; }
class FERROX_EXPORT BASE_CAPABILITY("mutex") Mutex {
 public:
  Mutex();
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;
  ~Mutex();

  /// Blocks until the mutex is free, without a limit of time, and takes it.
  bool Lock() BASE_ACQUIRE();
  /// Takes the mutex if it is free. Does not block; false when another thread, or this one, holds it.
  bool TryLock() BASE_TRY_ACQUIRE(true);
  /// Gives the mutex back. Only on the thread that holds it.
  bool Unlock() BASE_RELEASE();

 private:
  pthread_mutex_t mutex_ = {};
};

/// Holds a Mutex while it lives; the mutex must outlive it. Its constructor blocks until the mutex is free. What Lock
/// and Unlock return is passed over: on a mutex of this kind they fail only when it is used against its rules.
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
