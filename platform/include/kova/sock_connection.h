#pragma once

#include <cstdint>
#include <string>

/// Connections to the daemons of this host. A message is a frame: a 4-byte length in host byte order, then that many
/// bytes. A failed call records its reason for KLIBCErrGet.
///   kovadaemon::DomainSockConnection connection("/var/run/kovaelasticd.sock");
///   std::string reply;
///   if (!connection.Connect() || !connection.Send(request) || !connection.Recv(reply)) return false;
namespace kovadaemon {

/// Learns on which sockets threads wait for a peer, so that another thread can end such a wait by shutting the socket
/// down. Its functions are called by the waiting threads, several at once.
class __attribute__((visibility("default"))) SocketWaits {
 public:
  virtual ~SocketWaits();
  virtual void Begin(int fd) const = 0;  ///< the calling thread is about to wait; `fd` stays open until End
  virtual void End(int fd) const = 0;    ///< the wait is over, with success or without; `fd` may be closed now
};

/// Reports the waits of the calling thread to `waits` from now on, to nobody when null: those of this interface's
/// connections and of content extraction. @return what they were reported to before. The caller keeps `waits` alive
/// until it has been replaced; each thread has its own setting, null at first.
__attribute__((visibility("default"))) const SocketWaits* SetSocketWaits(const SocketWaits* waits);

/// Reports one wait of the calling thread while it lives; for those who wait on sockets of their own. Does nothing in a
/// thread without SocketWaits. It neither owns the descriptor nor waits itself:
///   const kovadaemon::SocketWait wait(fd);
///   const ssize_t got = recv(fd, buffer, sizeof(buffer), 0);
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

/// One connection that carries whole messages. Belongs to one thread. Owns its socket and closes it at the end of its
/// life. After a failure a message may have passed in part: connect anew before the next one.
class __attribute__((visibility("default"))) SockConnection {
 public:
  SockConnection() = default;
  SockConnection(const SockConnection&) = delete;
  SockConnection& operator=(const SockConnection&) = delete;
  virtual ~SockConnection();

  /// Connects, in place of an earlier connection of this object; false when the peer is not there or takes no
  /// connection for 10 s. This wait is not reported to SocketWaits. Nothing can be sent or received before it has
  /// succeeded.
  virtual bool Connect() = 0;
  /// Sends one message; false when it is over the limit, or the peer is gone or takes nothing for `kIdleTimeoutSec`.
  /// A message over the limit is not begun. No SIGPIPE is raised.
  bool Send(const std::string& message);
  /// Receives one message into `message`; false when the peer closes early, or announces more than the limit.
  /// Blocks until the peer answers or closes, without a limit of time: an answer may take long to compute. `message` is
  /// empty after a failure. Memory is taken as bytes come, not for the length that was announced.
  bool Recv(std::string& message);

  /// The largest message, in bytes, either way; 256 MiB unless set.
  void SetMessageLimit(uint32_t bytes) { message_limit_bytes_ = bytes; }

  /// How long Send waits for the peer to take one more byte. For the whole of a message there is no limit.
  static constexpr int kIdleTimeoutSec = 60;

 protected:
  int fd_ = -1;  ///< the connected socket, -1 without one; a derived class's Connect sets it
  uint32_t message_limit_bytes_ = 256U << 20;
};

/// The same over a Unix-domain socket. Its path, as it is given, must fit into a socket's address (107 bytes); a longer
/// one makes Connect fail with KOVA_ERR_BAD_PARAMETER.
class __attribute__((visibility("default"))) DomainSockConnection : public SockConnection {
 public:
  explicit DomainSockConnection(const std::string& socket_path) : socket_path_(socket_path) {}
  bool Connect() override;

 private:
  std::string socket_path_;
};

}  // namespace kovadaemon
