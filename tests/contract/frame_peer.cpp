#include "tests/contract/frame_peer.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdint>
#include <cstring>
#include <stdexcept>

namespace ferrox::test {

namespace {

bool ReadExactly(int fd, char* data, size_t size) {
  for (size_t have = 0; have < size;) {
    const ssize_t got = read(fd, data + have, size - have);
    if (got <= 0) return false;
    have += static_cast<size_t>(got);
  }
  return true;
}

void Serve(int listener, const std::function<std::string(const std::string&)>& reply) {
  const int fd = accept(listener, nullptr, nullptr);
  if (fd < 0) return;
  uint32_t length = 0;
  if (ReadExactly(fd, reinterpret_cast<char*>(&length), sizeof(length))) {
    std::string request(length, '\0');
    if (ReadExactly(fd, request.data(), length)) {
      const std::string answer = reply(request);
      // The first bytes one by one, so that short reads are tested too.
      size_t sent = 0;
      while (sent < answer.size()) {
        const size_t piece = sent < 6 ? 1 : answer.size() - sent;
        const ssize_t written = send(fd, answer.data() + sent, piece, MSG_NOSIGNAL);
        if (written <= 0) break;
        sent += static_cast<size_t>(written);
      }
    }
  }
  (void)close(fd);
}

}  // namespace

std::string Frame(const std::string& message) {
  const auto length = static_cast<uint32_t>(message.size());
  std::string frame(sizeof(length), '\0');
  memcpy(frame.data(), &length, sizeof(length));
  return frame + message;
}

FramePeer::FramePeer(const std::string& path, std::function<std::string(const std::string&)> reply) : path_(path) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  memcpy(address.sun_path, path.c_str(), path.size() + 1);
  listener_ = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (bind(listener_, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0 || listen(listener_, 1) != 0) {
    throw std::runtime_error("cannot listen on " + path);
  }
  thread_ = std::thread([this, reply = std::move(reply)] { Serve(listener_, reply); });
}

FramePeer::~FramePeer() {
  (void)shutdown(listener_, SHUT_RDWR);  // ends a wait for a connection that never came
  thread_.join();
  (void)close(listener_);
  (void)unlink(path_.c_str());
}

}  // namespace ferrox::test
