#include <unistd.h>

#include <kova/sock_connection.h>

#include "platform/shared/frames.h"

namespace kovadaemon {

SockConnection::~SockConnection() {
  if (fd_ >= 0) (void)close(fd_);
}

bool SockConnection::Send(const std::string& message) {
  const SocketWait wait(fd_);
  return kova::SendFrame(fd_, message, message_limit_bytes_, kIdleTimeoutSec * 1000);
}

bool SockConnection::Recv(std::string& message) {
  const SocketWait wait(fd_);
  return kova::RecvFrame(fd_, message, message_limit_bytes_);
}

bool DomainSockConnection::Connect() {
  if (fd_ >= 0) (void)close(fd_);
  fd_ = kova::ConnectUnixSocket(socket_path_);
  return fd_ >= 0;
}

}  // namespace kovadaemon
