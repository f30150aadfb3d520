#pragma once

/// What a mutex guards, told to the compiler: clang's -Wthread-safety refuses code that touches a guarded member, or
/// calls a function that needs the mutex, without holding it. Other compilers see nothing. Nothing here costs time or
/// memory when the program runs: the words are checked while it is compiled. base::Mutex (base/mutex.h) is made
/// for them, and so is ferrox::Mutex (common/mutex.h) for programs that use the installed headers:
///   base::Mutex mutex_;
///   std::vector<Job> jobs_ BASE_GUARDED_BY(mutex_);
///   void Take(Job job) BASE_EXCLUDES(mutex_);      // takes the mutex itself
///   void DropOldest() BASE_REQUIRES(mutex_);       // is called with the mutex held
#if defined(__clang__)
#define BASE_THREAD_ANNOTATION(x) __attribute__((x))
#else
#define BASE_THREAD_ANNOTATION(x)
#endif

/// A class whose objects can be held; `name` is the word that the compiler's messages use.
#define BASE_CAPABILITY(name) BASE_THREAD_ANNOTATION(capability(name))
/// A class whose objects hold a mutex from their constructor to their destructor.
#define BASE_SCOPED_CAPABILITY BASE_THREAD_ANNOTATION(scoped_lockable)
/// A member that may be touched only while the mutex is held: read while it is held in either way, written only while
/// it is held alone. The second form is for what a pointer points to; the pointer itself is then free.
#define BASE_GUARDED_BY(mutex) BASE_THREAD_ANNOTATION(guarded_by(mutex))
#define BASE_PT_GUARDED_BY(mutex) BASE_THREAD_ANNOTATION(pt_guarded_by(mutex))
/// A function whose caller holds the mutex, or holds it for reading, or must not hold it. The last is only checked
/// where the compiler sees the mutex held: it is no proof that a deadlock is impossible.
#define BASE_REQUIRES(...) BASE_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))
#define BASE_REQUIRES_SHARED(...) BASE_THREAD_ANNOTATION(requires_shared_capability(__VA_ARGS__))
#define BASE_EXCLUDES(...) BASE_THREAD_ANNOTATION(locks_excluded(__VA_ARGS__))
/// A function that takes or gives back the mutex: without arguments the object itself, as in a mutex's own members, or
/// what a lock object was made with. The first argument of TRY_ACQUIRE is the result that says that the mutex was
/// taken. RELEASE_GENERIC gives it back in whichever way it was held.
#define BASE_ACQUIRE(...) BASE_THREAD_ANNOTATION(acquire_capability(__VA_ARGS__))
#define BASE_ACQUIRE_SHARED(...) BASE_THREAD_ANNOTATION(acquire_shared_capability(__VA_ARGS__))
#define BASE_TRY_ACQUIRE(...) BASE_THREAD_ANNOTATION(try_acquire_capability(__VA_ARGS__))
#define BASE_RELEASE(...) BASE_THREAD_ANNOTATION(release_capability(__VA_ARGS__))
#define BASE_RELEASE_GENERIC(...) BASE_THREAD_ANNOTATION(release_generic_capability(__VA_ARGS__))
/// Two mutexes of one object that are held together are taken in this order. Clang checks it only with
/// -Wthread-safety-beta; it is for readers first.
#define BASE_ACQUIRED_BEFORE(...) BASE_THREAD_ANNOTATION(acquired_before(__VA_ARGS__))
#define BASE_ACQUIRED_AFTER(...) BASE_THREAD_ANNOTATION(acquired_after(__VA_ARGS__))
/// A function that returns a reference to the mutex.
#define BASE_RETURN_CAPABILITY(mutex) BASE_THREAD_ANNOTATION(lock_returned(mutex))
/// For the few functions that hold a mutex in a way that the compiler cannot follow; say there why.
#define BASE_NO_THREAD_SAFETY_ANALYSIS BASE_THREAD_ANNOTATION(no_thread_safety_analysis)
