#include "base/frames.h"

#include <poll.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "base/descriptor_passing.h"

namespace base {

namespace {

constexpr size_t kReceiveStepBytes = 64 * 1024;
constexpr int kConnectSec = 10;

/// Waits until the socket can be read or written; `timeout_ms` -1 waits for ever. A closed peer counts as ready.
bool WaitFor(int fd, short events, int timeout_ms) {
  pollfd state = {fd, events, 0};
  int ready;
  do {
    ready = poll(&state, 1, timeout_ms);
  } while (ready < 0 && errno == EINTR);
  if (ready == 0) errno = ETIMEDOUT;
  return ready > 0;
}

/// What of a frame has been sent, and the descriptor that goes with its first byte.
struct Outgoing {
  char header[sizeof(uint32_t)];
  const std::string& body;
  int descriptor;
  size_t sent = 0;

  size_t Left() const { return sizeof(header) + body.size() - sent; }

  ssize_t Send(int fd) {
    const size_t of_header = std::min(sent, sizeof(header)), of_body = sent - of_header;
    iovec parts[] = {{header + of_header, sizeof(header) - of_header},
                     {const_cast<char*>(body.data()) + of_body, body.size() - of_body}};
    alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))] = {};
    msghdr message = {};
    message.msg_iov = parts;
    message.msg_iovlen = 2;
    if (descriptor >= 0 && sent == 0) {
      message.msg_control = control;
      message.msg_controllen = sizeof(control);
      cmsghdr* ancillary = CMSG_FIRSTHDR(&message);
      ancillary->cmsg_level = SOL_SOCKET;
      ancillary->cmsg_type = SCM_RIGHTS;
      ancillary->cmsg_len = CMSG_LEN(sizeof(int));
      memcpy(CMSG_DATA(ancillary), &descriptor, sizeof(int));
    }
    return sendmsg(fd, &message, MSG_NOSIGNAL | MSG_DONTWAIT);
  }
};

bool SendAll(int fd, Outgoing& frame, int idle_timeout_ms) {
  while (frame.Left() > 0) {
    const ssize_t sent = frame.Send(fd);
    if (sent > 0) {
      frame.sent += static_cast<size_t>(sent);
    } else if (sent < 0 && errno == EAGAIN) {
      if (!WaitFor(fd, POLLOUT, idle_timeout_ms)) return false;
    } else if (sent == 0 || errno != EINTR) {
      return false;
    }
  }
  return true;
}

/// Keeps the first descriptor that comes, if it is wanted; others are closed.
ssize_t Recv(int fd, char* data, size_t size, UniqueFd* descriptor) {
  if (descriptor == nullptr) return recv(fd, data, size, 0);
  int received = -1;
  const ssize_t got = ReceiveWithDescriptors(fd, data, size, &received, 1);
  UniqueFd owned(received);
  if (owned.Valid() && !descriptor->Valid()) *descriptor = std::move(owned);
  return got;
}

bool RecvAll(int fd, char* data, size_t size, int idle_timeout_ms, UniqueFd* descriptor = nullptr) {
  while (size > 0) {
    if (idle_timeout_ms >= 0 && !WaitFor(fd, POLLIN, idle_timeout_ms)) return false;
    const ssize_t got = Recv(fd, data, size, descriptor);
    if (got > 0) {
      data += got;
      size -= static_cast<size_t>(got);
    } else if (got < 0 && errno == EAGAIN) {
      if (!WaitFor(fd, POLLIN, -1)) return false;
    } else if (got == 0 || errno != EINTR) {
      return false;
    }
  }
  return true;
}

/// A connect that a signal interrupts goes on in the kernel; SO_ERROR holds its outcome once the socket is writable.
bool FinishConnect(int fd) {
  if (!WaitFor(fd, POLLOUT, kConnectSec * 1000)) return false;
  int error = 0;
  socklen_t size = sizeof(error);
  if (getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &size) != 0) return false;
  errno = error;
  return error == 0;
}

}  // namespace

UniqueFd ConnectUnixSocket(const std::string& path) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof(address.sun_path)) {
    errno = ENAMETOOLONG;
    return UniqueFd();
  }
  memcpy(address.sun_path, path.c_str(), path.size() + 1);
  UniqueFd connection(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  if (!connection.Valid()) return connection;
  const timeval longest = {kConnectSec, 0};
  (void)setsockopt(connection.Get(), SOL_SOCKET, SO_SNDTIMEO, &longest, sizeof(longest));
  const bool connected = connect(connection.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0 ||
                         (errno == EINTR && FinishConnect(connection.Get()));
  if (!connected) connection.Reset();
  return connection;
}

bool SendFrame(int fd, const std::string& message, uint32_t limit_bytes, int idle_timeout_ms, int descriptor) {
  if (message.size() > limit_bytes) {
    errno = EMSGSIZE;
    return false;
  }
  const auto length = static_cast<uint32_t>(message.size());
  Outgoing frame = {{}, message, descriptor};
  memcpy(frame.header, &length, sizeof(length));
  return SendAll(fd, frame, idle_timeout_ms);
}

bool RecvFrame(int fd, std::string& message, uint32_t limit_bytes, int idle_timeout_ms, UniqueFd* descriptor) {
  message.clear();
  uint32_t length = 0;
  char header[sizeof(length)];
  errno = 0;
  if (!RecvAll(fd, header, sizeof(header), idle_timeout_ms, descriptor)) return false;
  memcpy(&length, header, sizeof(length));
  if (length > limit_bytes) {
    errno = EMSGSIZE;
    return false;
  }
  while (message.size() < length) {
    const size_t have = message.size();
    message.resize(have + std::min(length - have, std::max(kReceiveStepBytes, have)));
    if (RecvAll(fd, message.data() + have, message.size() - have, idle_timeout_ms)) continue;
    message.clear();
    return false;
  }
  return true;
}

}  // namespace base
