#include "cli/web_client.h"

#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <cstring>

#include "base/files.h"
#include "base/unique_fd.h"
#include "common/json_util.h"
#include "common/paths.h"
#include "services/support/web_user.h"

namespace ferrox::cli {

namespace {

using Outcome = WebReply::Outcome;

constexpr size_t kAnswerMaxBytes = 16U << 20;

Outcome ConnectToWebDaemon(base::UniqueFd& connection, std::chrono::seconds longest) {
  const std::string path = InstancePath(services::kWebSocket);
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  if (path.size() >= sizeof(address.sun_path)) return Outcome::kNotRunning;
  memcpy(address.sun_path, path.c_str(), path.size() + 1);
  connection.Reset(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const timeval limit = {static_cast<time_t>(longest.count()), 0};
  for (const int option : {SO_RCVTIMEO, SO_SNDTIMEO}) {
    (void)setsockopt(connection.Get(), SOL_SOCKET, option, &limit, sizeof(limit));
  }
  if (connect(connection.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0) {
    return Outcome::kAnswered;
  }
  if (errno == EACCES) return Outcome::kNotPermitted;
  return errno == EAGAIN ? Outcome::kNoAnswer : Outcome::kNotRunning;
}

/// The daemon closes behind its answer, so that the end of the answer is that of the stream.
std::string RequestText(const std::string& method, const std::string& target, const std::string& body) {
  std::string text = method + " " + target + " HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\n";
  if (!body.empty()) {
    text += "Content-Type: application/json\r\nContent-Length: " + std::to_string(body.size()) + "\r\n";
  }
  return text + "\r\n" + body;
}

/// "HTTP/1.1 200 OK", headers, an empty line, and JSON.
bool ReadAnswer(const std::string& text, WebReply& reply) {
  const size_t blank = text.find(' ');
  const size_t end = text.find("\r\n\r\n");
  if (!text.starts_with("HTTP/1.") || end == std::string::npos || blank > end) return false;
  const auto read = std::from_chars(text.data() + blank + 1, text.data() + end, reply.status);
  return read.ec == std::errc() && fromString(reply.body, text.substr(end + 4)) && reply.body.isObject();
}

}  // namespace

WebReply AskWebDaemon(const std::string& method, const std::string& target, const Json::Value& body,
                      std::chrono::seconds longest) {
  WebReply reply;
  base::UniqueFd connection;
  reply.outcome = ConnectToWebDaemon(connection, longest);
  if (reply.outcome != Outcome::kAnswered) return reply;
  std::string answer;
  const std::string request = RequestText(method, target, body.isNull() ? "" : toString(body));
  const bool answered =
      send(connection.Get(), request.data(), request.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(request.size()) &&
      base::ReadAll(connection.Get(), answer, kAnswerMaxBytes) && ReadAnswer(answer, reply);
  if (!answered) reply.outcome = Outcome::kNoAnswer;
  return reply;
}

}  // namespace ferrox::cli
