#include "platform/shared/frames.h"

#include <cerrno>

#include "base/frames.h"
#include "platform/shared/failure.h"

namespace kova {

namespace {

bool Recorded(bool succeeded) {
  if (!succeeded) (void)KOVA_FAIL(KOVA_ERR_SYSTEM);
  return succeeded;
}

}  // namespace

int ConnectUnixSocket(const std::string& path) {
  base::UniqueFd connection = base::ConnectUnixSocket(path);
  if (connection.Valid()) return connection.Release();
  return KOVA_FAIL(errno == ENAMETOOLONG ? KOVA_ERR_BAD_PARAMETER : SystemFailureCode());
}

bool SendFrame(int fd, const std::string& message, uint32_t limit_bytes, int idle_timeout_ms, int descriptor) {
  return Recorded(base::SendFrame(fd, message, limit_bytes, idle_timeout_ms, descriptor));
}

bool RecvFrame(int fd, std::string& message, uint32_t limit_bytes, int idle_timeout_ms) {
  return Recorded(base::RecvFrame(fd, message, limit_bytes, idle_timeout_ms));
}

}  // namespace kova
