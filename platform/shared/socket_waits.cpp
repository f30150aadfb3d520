#include <utility>

#include <kova/sock_connection.h>

namespace kovadaemon {

namespace {

thread_local const SocketWaits* t_waits = nullptr;

}  // namespace

SocketWaits::~SocketWaits() = default;

const SocketWaits* SetSocketWaits(const SocketWaits* waits) { return std::exchange(t_waits, waits); }

SocketWait::SocketWait(int fd) : waits_(t_waits), fd_(fd) {
  if (waits_ != nullptr) waits_->Begin(fd_);
}

SocketWait::~SocketWait() {
  if (waits_ != nullptr) waits_->End(fd_);
}

}  // namespace kovadaemon
