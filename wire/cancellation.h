#pragma once

#include <set>

#include <kova/sock_connection.h>

#include "base/mutex.h"

namespace ferrox::wire {

/// Lets one thread end the waits of others for daemons that may never answer. It ends those of threads that have a
/// CancellationScope of it: in FrameClient, in elastic::SendRequest and in content extraction, all of which report the
/// sockets on which they wait (SocketWaits). Each then fails as if the daemon had closed. SendCommandToDaemon reports
/// nothing and cannot be cancelled; nor can a connect, which ends by itself after 10 s.
///
/// A wait is ended by shutting its socket down, and not by a signal: a shutdown that comes before the wait begins is
/// not lost, and the socket's owner need not look for a flag.
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
  // Called by the waiting threads. A descriptor is closed only after its End, so that what is shut down is never a
  // later file of the same number.
  void Begin(int fd) const override;
  void End(int fd) const override;

  mutable base::Mutex mutex_;
  mutable std::set<int> sockets_ BASE_GUARDED_BY(mutex_);  ///< on which threads wait now
  bool cancelled_ BASE_GUARDED_BY(mutex_) = false;         ///< never false again
};

/// Makes a cancellation that of the calling thread while the scope lives; then the one before is it again.
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
