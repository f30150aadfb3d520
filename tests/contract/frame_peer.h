#pragma once

#include <functional>
#include <string>
#include <thread>

namespace ferrox::test {

/// The message as it is on the wire.
std::string Frame(const std::string& message);

/// Serves one connection on a Unix socket: reads one message, writes what `reply` makes of it as it stands, and closes.
class FramePeer {
 public:
  FramePeer(const std::string& path, std::function<std::string(const std::string&)> reply);
  FramePeer(const FramePeer&) = delete;
  FramePeer& operator=(const FramePeer&) = delete;
  ~FramePeer();

 private:
  std::string path_;
  int listener_;
  std::thread thread_;
};

}  // namespace ferrox::test
