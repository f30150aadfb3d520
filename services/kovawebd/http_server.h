#pragma once

#include <functional>
#include <memory>
#include <vector>

#include "services/kovawebd/listener.h"
#include "services/kovawebd/message.h"

namespace ferrox::web {

/// Serves HTTP/1.1 on sockets that listen, by libmicrohttpd. Connections are held by one thread for each socket;
/// requests are answered by threads of their own, so that one that waits holds up no other. Bounds: the header of a
/// request 16 KiB, its body 64 KiB, 30 s in which no byte moves, connections in all and from one address, requests
/// that wait for a thread. Whatever a client does costs its own connection alone. Nothing of a request is logged.
class HttpServer {
 public:
  /// Answers one request; called on several threads at once. May throw a Problem; what else it throws becomes 500.
  using Handler = std::function<Response(const Request& request)>;

  /// Serves from now on. @throws Error kInternal.
  HttpServer(std::vector<Listener> listeners, Handler handler);
  HttpServer(const HttpServer&) = delete;
  HttpServer& operator=(const HttpServer&) = delete;
  /// Waits for the requests being answered; others get 503.
  ~HttpServer();

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace ferrox::web
