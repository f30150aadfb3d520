#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::services {

/// Who asks, as the kernel knew it when the connection was made (SO_PEERCRED, SO_PEERGROUPS): nothing that the peer
/// says itself.
struct Peer {
  uid_t uid = 0;
  gid_t gid = 0;
  pid_t pid = 0;
  std::vector<gid_t> groups = {};  ///< the supplementary ones, in the kernel's order; `gid` need not be among them
  int descriptor = -1;  ///< the last that came with its requests, open as long as its connection is; -1: none
};

/// What a request is answered with, and a descriptor that goes with it (SCM_RIGHTS), none unless it is given.
struct FrameReply {
  FrameReply(std::string text, base::UniqueFd passed = {}) : body(std::move(text)), descriptor(std::move(passed)) {}

  std::string body;
  base::UniqueFd descriptor;
};

/// What each of those who are bound may use of a server. All of them together have connections and workers of their
/// own, half as many as the others have; these workers stand behind all others at the processor (base/priority.h), and
/// a connection is made by a thread that does. So the others find the server as free as without them.
struct UserLimits {
  /// Whether a peer is bound; null: nobody is.
  std::function<bool(const Peer& peer)> is_bound = nullptr;
  /// Of a bound peer, whether it asks for many users: of the following, only the size of requests binds it, beside what
  /// all bound users have together. Null: none does.
  std::function<bool(const Peer& peer)> is_for_many = nullptr;
  uint32_t request_limit_bytes = 64U << 10;
  /// Beyond these a new connection takes the place of the user's own that was idle for the longest time, or is closed.
  unsigned connections = 16;
  /// Requests that are answered at a time, and those that wait for their turn; a further one is refused at once.
  unsigned at_work = 2;
  unsigned waiting = 8;
  /// The reply that refuses it.
  std::string refusal = {};
};

struct FrameServerOptions {
  std::string socket_path;
  mode_t socket_mode = 0600;
  /// The largest request, in bytes; a longer one ends its connection.
  uint32_t request_limit_bytes = 1U << 20;
  /// The bytes of all requests not yet answered; beyond it the connection that sends more is ended.
  uint64_t requests_limit_bytes = 256U << 20;
  unsigned connections_max = 256;
  unsigned workers = 4;
  /// A connection on which no byte moves for this long is ended, between two requests too.
  std::chrono::seconds idle_timeout{60};
  UserLimits users = {};
  /// Whether a request may bring a descriptor (SCM_RIGHTS) along; else it is closed.
  bool takes_descriptors = false;
  /// Called with the descriptor of a connection when that ends.
  std::function<void(int descriptor)> on_end = [](int) {};
  /// Called once when Run begins to end, before it waits for the requests being answered: it may hurry them.
  std::function<void()> on_stop = [] {};
};

/// Serves requests and replies on a Unix-domain socket, each a 4-byte length in host byte order and that many bytes. A
/// connection may carry several requests, one after the other. A peer that is silent, slow, announces too much or
/// leaves early costs its own connection and nothing else: memory grows with the bytes received, and when all
/// connections are taken, or the process has no descriptor left, the one that was idle for the longest time is ended
/// in favour of the new one.
class FrameServer {
 public:
  /// Answers one request; called on one of the workers, which has just read it. An exception ends that connection
  /// alone.
  using Handler = std::function<FrameReply(const std::string& request, const Peer& peer)>;

  /// Binds and listens. A socket file left by a dead process is replaced; one that answers is not.
  /// @throws Error kInternal, with the path and what to do, when the socket cannot be had.
  FrameServer(FrameServerOptions options, Handler handler);
  FrameServer(const FrameServer&) = delete;
  FrameServer& operator=(const FrameServer&) = delete;
  /// Stops, waits for the requests being answered, and removes the socket file.
  ~FrameServer();

  /// Serves until Stop() or until `stop_fd` (-1: none) becomes readable; returns after the last reply.
  void Run(int stop_fd);
  /// Ends Run; from any thread or a signal handler.
  void Stop();

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace ferrox::services
