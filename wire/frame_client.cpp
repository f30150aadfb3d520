#include "wire/frame_client.h"

#include <cerrno>

#include <kova/sock_connection.h>

#include "base/frames.h"
#include "common/json_util.h"
#include "common/paths.h"

namespace ferrox::wire {

namespace {

/// The engine's own limit of a request; no other daemon takes or sends as much.
constexpr uint32_t kMessageMaxBytes = 256U << 20;
/// A daemon that takes nothing for a minute is given up, however long its answer may take.
constexpr int kSendIdleMs = 60000;

/// Only a socket that is missing or that nobody serves is that of a daemon that does not run.
Outcome WhyNotConnected(int error) {
  if (error == ENOENT || error == ENOTDIR || error == ECONNREFUSED) return Outcome::kNotRunning;
  return error == EACCES || error == EPERM ? Outcome::kNotPermitted : Outcome::kNoAnswer;
}

/// What the call that just failed left in errno; 0 for the end of the stream.
Outcome WhyCutShort(int error) {
  if (error == ETIMEDOUT) return Outcome::kNoAnswer;
  return error == EMSGSIZE ? Outcome::kUnreadable : Outcome::kPeerClosed;
}

/// One request and its reply, up to the first step that fails.
Outcome Exchange(FrameClient& client, const std::string& request, std::string& reply, std::chrono::milliseconds longest,
                 base::UniqueFd* descriptor) {
  Outcome outcome = client.Connect();
  if (outcome == Outcome::kAnswered) outcome = client.Send(request);
  return outcome == Outcome::kAnswered ? client.Receive(reply, longest, descriptor) : outcome;
}

/// A reply without "success" refuses the request, as one with a false one does.
Reply ReadReply(const std::string& text) {
  Json::Value json;
  Reply reply;
  reply.outcome = Outcome::kUnreadable;
  if (!fromString(json, text) || !json.isObject()) return reply;
  const Json::Value& success = json["success"];
  reply.outcome = isJsonType<bool>(success) && asJsonType<bool>(success) ? Outcome::kAnswered : Outcome::kRefused;
  if (reply.outcome == Outcome::kAnswered) {
    reply.data = std::move(json["data"]);
    return reply;
  }
  reply.error = std::move(json["error"]);
  if (!reply.error.isObject()) return reply;
  GetJsonValue(reply.code, reply.error, "code", false);
  GetJsonValue(reply.message, reply.error, "msg", false);
  return reply;
}

Reply Ask(const char* socket, const std::string& request, std::chrono::milliseconds longest,
          base::UniqueFd* descriptor = nullptr) {
  FrameClient client(InstancePath(socket));
  std::string text;
  Reply reply;
  reply.outcome = Exchange(client, request, text, longest, descriptor);
  return reply.outcome == Outcome::kAnswered ? ReadReply(text) : reply;
}

}  // namespace

Outcome FrameClient::Connect() {
  socket_ = base::ConnectUnixSocket(socket_path_);
  return socket_.Valid() ? Outcome::kAnswered : WhyNotConnected(errno);
}

// Each wait is reported (SocketWaits), so that a Cancellation of this thread can end it.
Outcome FrameClient::Send(const std::string& message) {
  const kovadaemon::SocketWait wait(socket_.Get());
  if (base::SendFrame(socket_.Get(), message, kMessageMaxBytes, kSendIdleMs)) return Outcome::kAnswered;
  return WhyCutShort(errno);
}

Outcome FrameClient::Receive(std::string& message, std::chrono::milliseconds longest, base::UniqueFd* descriptor) {
  const kovadaemon::SocketWait wait(socket_.Get());
  const auto longest_ms = static_cast<int>(longest.count());
  if (base::RecvFrame(socket_.Get(), message, kMessageMaxBytes, longest_ms, descriptor)) return Outcome::kAnswered;
  return WhyCutShort(errno);
}

Reply AskEngine(const Json::Value& request, std::chrono::milliseconds longest) {
  return Ask(kElasticdSocket, toString(request), longest);
}

/// The library's own sender ends its text with the zero byte of a C string, and the daemons read both alike.
Reply AskDaemon(const char* socket, const std::string& type, const Json::Value& data, std::chrono::milliseconds longest,
                base::UniqueFd* descriptor) {
  Json::Value request;
  request["type"] = type;
  request["data"] = data;
  return Ask(socket, toString(request) + '\0', longest, descriptor);
}

/// The connection is closed without a request, which costs the daemon nothing.
bool IsServed(const std::string& socket_path) { return FrameClient(socket_path).Connect() != Outcome::kNotRunning; }

}  // namespace ferrox::wire
