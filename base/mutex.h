#pragma once

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <shared_mutex>

#include "base/thread_annotations.h"

/// The standard library's mutexes with what they guard told to the compiler (thread_annotations.h). Members that a
/// mutex guards are declared with BASE_GUARDED_BY, functions that expect it held with BASE_REQUIRES; clang then refuses
/// code that touches the one or calls the other without it:
///   base::Mutex mutex_;
///   size_t count_ BASE_GUARDED_BY(mutex_) = 0;
///   void Add() { const base::MutexLock lock(mutex_); ++count_; }
/// All of them must outlive the threads that use them.
namespace base {

/// Not recursive. Lock blocks until the mutex is free.
class BASE_CAPABILITY("mutex") Mutex {
 public:
  Mutex() = default;
  Mutex(const Mutex&) = delete;
  Mutex& operator=(const Mutex&) = delete;

  void Lock() BASE_ACQUIRE() { mutex_.lock(); }
  /// Takes the mutex if it is free. Does not block. @return whether it is held now.
  bool TryLock() BASE_TRY_ACQUIRE(true) { return mutex_.try_lock(); }
  void Unlock() BASE_RELEASE() { mutex_.unlock(); }

 private:
  friend class ConditionVariable;
  std::mutex mutex_;
};

/// Holds a Mutex while it lives, apart from the times between Unlock and Lock.
class BASE_SCOPED_CAPABILITY MutexLock {
 public:
  explicit MutexLock(Mutex& mutex) BASE_ACQUIRE(mutex) : mutex_(mutex) { mutex_.Lock(); }
  MutexLock(const MutexLock&) = delete;
  MutexLock& operator=(const MutexLock&) = delete;
  ~MutexLock() BASE_RELEASE() {
    if (held_) mutex_.Unlock();
  }

  void Unlock() BASE_RELEASE() {
    mutex_.Unlock();
    held_ = false;
  }
  void Lock() BASE_ACQUIRE() {
    mutex_.Lock();
    held_ = true;
  }

 private:
  Mutex& mutex_;
  bool held_ = true;
};

/// Lets threads wait for a change of what a Mutex guards. A wait gives the mutex back meanwhile, holds it again when it
/// returns, and may return without a reason: callers look at their condition in a loop, in plain sight of the compiler.
class ConditionVariable {
 public:
  ConditionVariable() = default;
  ConditionVariable(const ConditionVariable&) = delete;
  ConditionVariable& operator=(const ConditionVariable&) = delete;

  void Wait(Mutex& mutex) BASE_REQUIRES(mutex) {
    std::unique_lock<std::mutex> held(mutex.mutex_, std::adopt_lock);
    condition_.wait(held);
    (void)held.release();
  }
  /// @return false when the time has come without a notification.
  template <typename Clock, typename Duration>
  bool WaitUntil(Mutex& mutex, const std::chrono::time_point<Clock, Duration>& time) BASE_REQUIRES(mutex) {
    std::unique_lock<std::mutex> held(mutex.mutex_, std::adopt_lock);
    const std::cv_status status = condition_.wait_until(held, time);
    (void)held.release();
    return status == std::cv_status::no_timeout;
  }
  template <typename Rep, typename Period>
  bool WaitFor(Mutex& mutex, const std::chrono::duration<Rep, Period>& duration) BASE_REQUIRES(mutex) {
    return WaitUntil(mutex, std::chrono::steady_clock::now() + duration);
  }

  /// Wake one waiting thread, or all. The mutex need not be held; what was changed must have been changed under it.
  void NotifyOne() { condition_.notify_one(); }
  void NotifyAll() { condition_.notify_all(); }

 private:
  std::condition_variable condition_;
};

/// Held by any number of readers or by one writer. Not recursive: a reader must not become the writer.
class BASE_CAPABILITY("shared mutex") SharedMutex {
 public:
  SharedMutex() = default;
  SharedMutex(const SharedMutex&) = delete;
  SharedMutex& operator=(const SharedMutex&) = delete;

  void Lock() BASE_ACQUIRE() { mutex_.lock(); }
  void Unlock() BASE_RELEASE() { mutex_.unlock(); }
  void LockShared() BASE_ACQUIRE_SHARED() { mutex_.lock_shared(); }
  void UnlockShared() BASE_THREAD_ANNOTATION(release_shared_capability()) { mutex_.unlock_shared(); }

 private:
  std::shared_mutex mutex_;
};

/// Holds a SharedMutex as its one writer, or as one of its readers, while it lives.
class BASE_SCOPED_CAPABILITY WriterLock {
 public:
  explicit WriterLock(SharedMutex& mutex) BASE_ACQUIRE(mutex) : mutex_(mutex) { mutex_.Lock(); }
  WriterLock(const WriterLock&) = delete;
  WriterLock& operator=(const WriterLock&) = delete;
  ~WriterLock() BASE_RELEASE() { mutex_.Unlock(); }

 private:
  SharedMutex& mutex_;
};
class BASE_SCOPED_CAPABILITY ReaderLock {
 public:
  explicit ReaderLock(SharedMutex& mutex) BASE_ACQUIRE_SHARED(mutex) : mutex_(mutex) { mutex_.LockShared(); }
  ReaderLock(const ReaderLock&) = delete;
  ReaderLock& operator=(const ReaderLock&) = delete;
  ~ReaderLock() BASE_RELEASE_GENERIC() { mutex_.UnlockShared(); }

 private:
  SharedMutex& mutex_;
};

}  // namespace base
