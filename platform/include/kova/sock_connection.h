#pragma once

#include <cstdint>
#include <string>

/// Connections to the daemons of this host. A message is a frame: a 4-byte length in host byte order, then that many
/// bytes. A failed call records its reason for KLIBCErrGet.
namespace kovadaemon {

/// Learns on which sockets threads wait for a peer, so that another thread can end such a wait by shutting the socket
/// down. Its functions are called by the waiting threads, several at once.
class __attribute__((visibility("default"))) SocketWaits {
 public:
  virtual ~SocketWaits();
  virtual void Begin(int fd) const = 0;  ///< the calling thread is about to wait; `fd` stays open until End
  virtual void End(int fd) const = 0;
};

/// Reports the waits of the calling thread to `waits` from now on, to nobody when null: those of this interface's
/// connections and of content extraction. @return what they were reported to before.
__attribute__((visibility("default"))) const SocketWaits* SetSocketWaits(const SocketWaits* waits);

/// Reports one wait of the calling thread while it lives; for those who wait on sockets of their own.
class __attribute__((visibility("default"))) SocketWait {
 public:
  explicit SocketWait(int fd);
  SocketWait(const SocketWait&) = delete;
  SocketWait& operator=(const SocketWait&) = delete;
  ~SocketWait();

 private:
  const SocketWaits* waits_;
  int fd_;
};

/// One connection that carries whole messages. Belongs to one thread.
class __attribute__((visibility("default"))) SockConnection {
 public:
  SockConnection() = default;
  SockConnection(const SockConnection&) = delete;
  SockConnection& operator=(const SockConnection&) = delete;
  virtual ~SockConnection();

  /// Connects, in place of an earlier connection of this object; false when the peer is not there or takes no
  /// connection for 10 s.
  virtual bool Connect() = 0;
  /// Sends one message; false when it is over the limit, or the peer is gone or takes nothing for `kIdleTimeoutSec`.
  bool Send(const std::string& message);
  /// Receives one message into `message`; false when the peer closes early, or announces more than the limit.
  /// Blocks until the peer answers or closes.
  bool Recv(std::string& message);

  /// The largest message, in bytes, either way; 256 MiB unless set.
  void SetMessageLimit(uint32_t bytes) { message_limit_bytes_ = bytes; }

  static constexpr int kIdleTimeoutSec = 60;

 protected:
  int fd_ = -1;
  uint32_t message_limit_bytes_ = 256U << 20;
};

/// The same over a Unix-domain socket.
class __attribute__((visibility("default"))) DomainSockConnection : public SockConnection {
 public:
  explicit DomainSockConnection(const std::string& socket_path) : socket_path_(socket_path) {}
  bool Connect() override;

 private:
  std::string socket_path_;
};

}  // namespace kovadaemon
