#include "common/mutex.h"

namespace ferrox {

Mutex::Mutex() { (void)pthread_mutex_init(&mutex_, nullptr); }
Mutex::~Mutex() { (void)pthread_mutex_destroy(&mutex_); }
bool Mutex::Lock() { return pthread_mutex_lock(&mutex_) == 0; }
bool Mutex::TryLock() { return pthread_mutex_trylock(&mutex_) == 0; }
bool Mutex::Unlock() { return pthread_mutex_unlock(&mutex_) == 0; }

}  // namespace ferrox
