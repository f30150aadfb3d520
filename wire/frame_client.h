#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include <json/value.h>

#include "base/unique_fd.h"

/// The one client of the daemons' sockets, for the tool and for the daemons among themselves. A message is a frame: a
/// 4-byte length in host byte order, then that many bytes; each connection carries one request and its reply
/// (docs/formats/daemon.md, engine.md). Nothing here is tried twice, logged or thrown.
///
/// The library's published senders (SendCommandToDaemon, elastic::SendRequest) stand beside it: programs rely on their
/// retries and on their errors.
namespace ferrox::wire {

enum class Outcome {
  kAnswered,      ///< the reply is there; of AskEngine and AskDaemon, with "success": true
  kRefused,       ///< the daemon's reply is an error
  kNotRunning,    ///< there is no socket, or nobody serves it
  kNotPermitted,  ///< this user may not connect to the socket
  kNoAnswer,      ///< it took no connection, no byte of the request or gave none of the reply in time
  kPeerClosed,    ///< it closed before its reply was complete, or the wait was cancelled (Cancellation)
  kUnreadable,    ///< its reply is over the limit, or no JSON object
};

/// One connection. Belongs to one thread; another may end its waits by a Cancellation.
class FrameClient {
 public:
  explicit FrameClient(std::string socket_path) : socket_path_(std::move(socket_path)) {}

  /// Blocks at most 10 s, while the daemon's backlog is full. Never kPeerClosed or kUnreadable.
  Outcome Connect();
  /// Sends one message of at most 256 MiB; the daemon must take some of it every 60 s.
  Outcome Send(const std::string& message);
  /// Receives one message of at most 256 MiB. Waits at most `longest` for its first byte, and as long for each piece
  /// that follows. Memory grows with what has come, not with the announced length.
  /// @param descriptor not null: gets the descriptor that came with the message, or none
  Outcome Receive(std::string& message, std::chrono::milliseconds longest, base::UniqueFd* descriptor = nullptr);

 private:
  std::string socket_path_;
  base::UniqueFd socket_;
};

/// What came of one request whose reply is {"success": bool, "data": ..., "error": {"code": int, "msg": text}}.
struct Reply {
  Outcome outcome = Outcome::kNoAnswer;
  Json::Value data;     ///< of kAnswered; null where the reply has none
  Json::Value error;    ///< of kRefused, as it came
  int code = 0;         ///< of kRefused: one of Error's codes; 0 where the reply has none
  std::string message;  ///< of kRefused: "" where the reply has none
};

/// Asks the search engine: {"command": ..., "data": ...}, see engine_requests.h.
Reply AskEngine(const Json::Value& request, std::chrono::milliseconds longest);
/// Sends {"type": type, "data": data} to the daemon that serves `socket`, one of the constants of common/paths.h. It
/// goes out as the library sends commands, with a zero byte at its end.
/// @param descriptor not null: gets the descriptor that came with the reply, or none
Reply AskDaemon(const char* socket, const std::string& type, const Json::Value& data, std::chrono::milliseconds longest,
                base::UniqueFd* descriptor = nullptr);

/// Whether a process serves the socket, also one that this user may not talk to.
bool IsServed(const std::string& socket_path);

}  // namespace ferrox::wire
