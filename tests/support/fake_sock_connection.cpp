#include <unistd.h>

#include <kova/sock_connection.h>

#include "platform/shared/failure.h"
#include "platform/shared/frames.h"
#include "tests/support/fake_platform.h"

using ferrox::test::FakeCallFails;
using ferrox::test::FakeConnection;
using ferrox::test::FakePlatform;

namespace kovadaemon {

namespace {

/// The descriptor of a scripted connection: never one that the system gives.
constexpr int kScripted = -2;
thread_local FakeConnection t_connection;

bool Refuse() {
  (void)KOVA_FAIL(KOVA_ERR_SYSTEM);
  return false;
}

}  // namespace

SockConnection::~SockConnection() {
  if (fd_ >= 0) (void)close(fd_);
}

bool DomainSockConnection::Connect() {
  FakePlatform& platform = FakePlatform::Get();
  if (FakeCallFails("Connect", socket_path_)) return false;
  platform.connected_paths.push_back(socket_path_);
  if (platform.connections.empty() && !platform.engine) {
    fd_ = kova::ConnectUnixSocket(socket_path_);
    return fd_ >= 0;
  }
  t_connection = {};
  if (!platform.connections.empty()) {
    t_connection = platform.connections.front();
    platform.connections.pop_front();
  }
  fd_ = t_connection.fault == FakeConnection::kConnect ? -1 : kScripted;
  return fd_ == kScripted || Refuse();
}

bool SockConnection::Send(const std::string& message) {
  if (FakeCallFails("Send", message)) return false;
  if (fd_ != kScripted) return kova::SendFrame(fd_, message, message_limit_bytes_, kIdleTimeoutSec * 1000);
  if (t_connection.fault == FakeConnection::kSend) return Refuse();
  FakePlatform& platform = FakePlatform::Get();
  platform.sent.push_back(message);
  if (t_connection.reply.empty() && platform.engine) t_connection.reply = platform.engine(message);
  return true;
}

bool SockConnection::Recv(std::string& message) {
  if (FakeCallFails("Recv", "")) return false;
  if (fd_ != kScripted) return kova::RecvFrame(fd_, message, message_limit_bytes_);
  if (t_connection.fault == FakeConnection::kRecv) return Refuse();
  message = std::exchange(t_connection.reply, {});
  return true;
}

}  // namespace kovadaemon
