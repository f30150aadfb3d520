#include "tests/support/unix_server.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <stdexcept>

namespace ferrox::test {

UnixServer::UnixServer(const std::string& path, std::function<void(int fd)> serve, int connections)
    : path_(path), listener_(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  (void)path.copy(address.sun_path, sizeof(address.sun_path) - 1);
  if (bind(listener_, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0 || listen(listener_, 1) != 0) {
    throw std::runtime_error("cannot listen at " + path);
  }
  thread_ = std::thread([this, serve = std::move(serve), connections] {
    for (int i = 0; i < connections; ++i) {
      const int fd = accept4(listener_, nullptr, nullptr, SOCK_CLOEXEC);
      if (fd < 0) return;
      serve(fd);
      (void)close(fd);
    }
  });
}

UnixServer::~UnixServer() {
  (void)shutdown(listener_, SHUT_RDWR);
  thread_.join();
  (void)close(listener_);
  (void)unlink(path_.c_str());
}

}  // namespace ferrox::test
