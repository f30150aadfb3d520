#pragma once

#include <cstdint>
#include <string>

#include "base/unique_fd.h"

/// Whole messages over a connected stream socket: a 4-byte length in host byte order, then that many bytes. A failure
/// is false (or no descriptor) and errno, which is 0 when the peer has closed the connection between two messages; the
/// connection is then of no more use. Signals interrupt none of these, SIGPIPE is never raised.
namespace base {

/// Connects to the Unix-domain socket at `path`. Not valid when that fails, with ETIMEDOUT or EAGAIN also when the peer
/// accepts nothing for 10 s (its backlog is full), with ENAMETOOLONG for a path that no socket address can hold.
UniqueFd ConnectUnixSocket(const std::string& path);

/// Sends one message, and unless it is -1 a duplicate of `descriptor` with its first byte. Blocks while the peer reads
/// nothing, at most `idle_timeout_ms` between two bytes (ETIMEDOUT; -1: no limit). A message over `limit_bytes` is not
/// begun (EMSGSIZE).
bool SendFrame(int fd, const std::string& message, uint32_t limit_bytes, int idle_timeout_ms, int descriptor = -1);

/// Receives one message into `message`, which is empty afterwards when that fails. Blocks until it is complete, at most
/// `idle_timeout_ms` without a byte (ETIMEDOUT; -1: no limit). A length over `limit_bytes` is refused (EMSGSIZE).
/// Memory grows with the bytes that have come, not with the length that was announced.
/// @param descriptor not null: gets the descriptor that came with the first byte, close-on-exec, or none
bool RecvFrame(int fd, std::string& message, uint32_t limit_bytes, int idle_timeout_ms = -1,
               UniqueFd* descriptor = nullptr);

}  // namespace base
