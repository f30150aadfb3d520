#include "common/communication.h"

#include <signal.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstring>

#include <json/value.h>

#include "base/unique_fd.h"
#include "common/clock.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"

namespace ferrox {

namespace {

constexpr unsigned int kPieceBytes = 1024;
constexpr int kInterruptionsMax = 10;
constexpr int kConnectAttempts = 5;
constexpr std::chrono::milliseconds kConnectPause{1000};
constexpr std::chrono::milliseconds kEndOfStreamPause{50};

/// Tries to reach the daemon, which may be about to make its socket. A connection that fails is not reported here: the
/// first write tells.
void ConnectToDaemon(int fd) {
  const std::string path = InstancePath(kFileIndexdSocket);
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  (void)path.copy(address.sun_path, sizeof(address.sun_path) - 1);
  for (int attempt = 1; connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0; ++attempt) {
    if (errno != ENOENT || attempt == kConnectAttempts) return;
    Clock::Get().SleepFor(kConnectPause);
  }
}

/// Receives one frame and drops it; no matter how long it says it is, it takes no more memory than one piece.
void SkipReply(int fd) {
  uint32_t left = 0;
  unsigned char piece[kPieceBytes];
  BufferRead(fd, sizeof(left), reinterpret_cast<unsigned char*>(&left));
  while (left > 0) {
    const uint32_t size = std::min(left, kPieceBytes);
    BufferRead(fd, size, piece);
    left -= size;
  }
}

}  // namespace

void SendCommandToDaemon(const std::string& command, const Json::Value& data) {
  (void)signal(SIGPIPE, SIG_IGN);
  const base::UniqueFd daemon(socket(PF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  FERROX_FAIL_IF_AS(!daemon.Valid(), "0 > (fd_socket = socket(PF_UNIX, SOCK_STREAM, 0))", Error::kInternal,
                    "socket failed, reason=" + ErrnoText());
  ConnectToDaemon(daemon.Get());
  timeval timeout = {};
  timeout.tv_sec = 1;
  FERROX_FAIL_IF_AS(0 > setsockopt(daemon.Get(), SOL_SOCKET, SO_SNDTIMEO, &timeout, sizeof(timeout)),
                    "0 > setsockopt(fd_socket, SOL_SOCKET, SO_SNDTIMEO, (char *)&timeout, sizeof(timeout))",
                    Error::kInternal, "setsockopt failed, reason=" + ErrnoText());

  Json::Value message(Json::objectValue);
  message["type"] = command;
  message["data"] = data;
  const std::string text = toString(message);
  const auto size = static_cast<uint32_t>(text.size() + 1);  // the terminating zero travels, too
  BufferWrite(daemon.Get(), sizeof(size), reinterpret_cast<const unsigned char*>(&size));
  BufferWrite(daemon.Get(), size, reinterpret_cast<const unsigned char*>(text.c_str()));
  SkipReply(daemon.Get());
}

void BufferWrite(int fd, unsigned int size, const unsigned char* buffer) {
  int interruptions = 0;
  while (size > 0) {
    const ssize_t written = write(fd, buffer, std::min(size, kPieceBytes));
    if (written > 0) {
      buffer += written;
      size -= static_cast<unsigned int>(written);
      continue;
    }
    FERROX_FAIL_IF(errno != EINTR || ++interruptions > kInterruptionsMax, Error::kInternal,
                   "write failed, reason=" + ErrnoText(), Subject{Subject::kDaemonChannel, ""});
  }
}

void BufferRead(int fd, unsigned int size, unsigned char* buffer) {
  int interruptions = 0;
  while (size > 0) {
    const ssize_t got = read(fd, buffer, std::min(size, kPieceBytes));
    if (got == -1) {
      FERROX_FAIL_IF(errno != EINTR || ++interruptions > kInterruptionsMax, Error::kInternal,
                     "read failed, reason=" + ErrnoText(), Subject{Subject::kDaemonChannel, ""});
      continue;
    }
    buffer += got;
    size -= static_cast<unsigned int>(got);
    // Deliberate: the end of the stream is no progress, not an end.
    if (got == 0) Clock::Get().SleepFor(kEndOfStreamPause);
  }
}

}  // namespace ferrox
