#pragma once

#include <functional>
#include <string>
#include <thread>

namespace ferrox::test {

/// A Unix socket at `path` that takes so many connections, one after the other, hands each to `serve` on a thread of
/// its own, and closes it.
class UnixServer {
 public:
  UnixServer(const std::string& path, std::function<void(int fd)> serve, int connections = 1);
  UnixServer(const UnixServer&) = delete;
  UnixServer& operator=(const UnixServer&) = delete;
  /// Waits for `serve` to return; gives up connections that nobody made.
  ~UnixServer();

 private:
  std::string path_;
  int listener_;
  std::thread thread_;
};

}  // namespace ferrox::test
