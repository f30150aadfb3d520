#pragma once

#include <set>

#include <kova/sock_connection.h>

#include "base/mutex.h"

namespace ferrox::wire {

/// Lets one thread end the waits of others for daemons that may never answer. The waits that it ends are those of
/// threads with a CancellationScope of it: in FrameClient, in the library's senders (SendCommandToDaemon apart, which
/// has a bound of its own only for sending) and in content extraction. Each then fails as if the daemon had closed.
class Cancellation : public kovadaemon::SocketWaits {
 public:
  Cancellation() = default;
  Cancellation(const Cancellation&) = delete;
  Cancellation& operator=(const Cancellation&) = delete;
  /// No thread may still have a scope of it.
  ~Cancellation() override = default;

  /// Ends the waits of now and each that begins later, for good. From any thread; does not wait for the others.
  void Cancel();

 private:
  void Begin(int fd) const override;
  void End(int fd) const override;

  mutable base::Mutex mutex_;
  mutable std::set<int> sockets_ BASE_GUARDED_BY(mutex_);  ///< on which threads wait now
  bool cancelled_ BASE_GUARDED_BY(mutex_) = false;
};

/// Makes a cancellation the calling thread's while it lives; then the one before is again.
class CancellationScope {
 public:
  explicit CancellationScope(const Cancellation& cancellation) : before_(kovadaemon::SetSocketWaits(&cancellation)) {}
  CancellationScope(const CancellationScope&) = delete;
  CancellationScope& operator=(const CancellationScope&) = delete;
  ~CancellationScope() { (void)kovadaemon::SetSocketWaits(before_); }

 private:
  const kovadaemon::SocketWaits* before_;
};

}  // namespace ferrox::wire
