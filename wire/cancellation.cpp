#include "wire/cancellation.h"

#include <sys/socket.h>

namespace ferrox::wire {

/// Does not wait for the waits to end: they do so on their own threads.
void Cancellation::Cancel() {
  const base::MutexLock lock(mutex_);
  cancelled_ = true;
  for (const int fd : sockets_) (void)shutdown(fd, SHUT_RDWR);
}

/// A wait that begins after Cancel ends at once: a socket that was shut down is ready, and has nothing.
void Cancellation::Begin(int fd) const {
  const base::MutexLock lock(mutex_);
  sockets_.insert(fd);
  if (cancelled_) (void)shutdown(fd, SHUT_RDWR);
}

void Cancellation::End(int fd) const {
  const base::MutexLock lock(mutex_);
  sockets_.erase(fd);
}

}  // namespace ferrox::wire
