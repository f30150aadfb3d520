#pragma once

#include <cstdint>
#include <string>

/// Whole messages over a connected socket: a 4-byte length in host byte order, then that many bytes.
namespace kova {

/// A stream socket connected to the Unix-domain socket at `path`, or -1 with the failure recorded, also when the peer
/// takes no connection for 10 s.
int ConnectUnixSocket(const std::string& path);

/// Sends one message, and a descriptor with it unless that is -1; false when the message is over the limit, the peer is
/// gone, or it takes nothing for `idle_timeout_ms`.
bool SendFrame(int fd, const std::string& message, uint32_t limit_bytes, int idle_timeout_ms, int descriptor = -1);

/// Receives one message. False when the peer closes early, sends nothing for `idle_timeout_ms` (-1: waits for as long
/// as it takes), or announces more than the limit. Memory grows with the bytes that have come, not with the length that
/// was announced.
bool RecvFrame(int fd, std::string& message, uint32_t limit_bytes, int idle_timeout_ms = -1);

}  // namespace kova
