#include "services/support/local_request.h"

#include <cerrno>

#include <kova/sock_connection.h>

#include "platform/shared/frames.h"

namespace ferrox::services {

namespace {

class Connection : public kovadaemon::DomainSockConnection {
 public:
  using DomainSockConnection::DomainSockConnection;

  bool Receive(std::string& reply, std::chrono::milliseconds longest) const {
    return kova::RecvFrame(fd_, reply, message_limit_bytes_, static_cast<int>(longest.count()));
  }
};

/// Only a socket that is missing or that nobody serves is that of a daemon that does not run.
RequestResult WhyNotConnected(int error) {
  if (error == ENOENT || error == ENOTDIR || error == ECONNREFUSED) return RequestResult::kNotRunning;
  return error == EACCES || error == EPERM ? RequestResult::kNotPermitted : RequestResult::kNoAnswer;
}

}  // namespace

RequestResult AskLocally(const std::string& socket_path, const std::string& request, std::chrono::milliseconds longest,
                         std::string& reply) {
  Connection connection(socket_path);
  if (!connection.Connect()) return WhyNotConnected(errno);
  const bool answered = connection.Send(request) && connection.Receive(reply, longest);
  return answered ? RequestResult::kAnswered : RequestResult::kNoAnswer;
}

bool IsServed(const std::string& socket_path) {
  Connection connection(socket_path);
  return connection.Connect() || WhyNotConnected(errno) != RequestResult::kNotRunning;
}

}  // namespace ferrox::services
