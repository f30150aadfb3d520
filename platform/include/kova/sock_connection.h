#pragma once

#include <cstdint>
#include <string>

namespace kovadaemon {

/// A stream socket that carries whole messages: a 4-byte length in host byte order, then that many bytes.
class __attribute__((visibility("default"))) SockConnection {
 public:
  SockConnection() = default;
  SockConnection(const SockConnection&) = delete;
  SockConnection& operator=(const SockConnection&) = delete;
  virtual ~SockConnection();

  /// Connects; false when the peer is not there.
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
