#pragma once

#include <cstdint>
#include <string>

/// The messages of base/frames.h as the platform sends and receives them: a failure is also recorded for the calling
/// thread (kova/error.h).
namespace kova {

/// base::ConnectUnixSocket; -1 when it fails. The caller owns the descriptor.
int ConnectUnixSocket(const std::string& path);

/// base::SendFrame and base::RecvFrame.
bool SendFrame(int fd, const std::string& message, uint32_t limit_bytes, int idle_timeout_ms, int descriptor = -1);
bool RecvFrame(int fd, std::string& message, uint32_t limit_bytes, int idle_timeout_ms = -1);

}  // namespace kova
