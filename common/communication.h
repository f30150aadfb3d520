#pragma once

#include <string>

#include <json/forwards.h>

#include "common/export.h"

/// The command channel to the index daemon: one command a connection, in frames of a 4-byte length in host byte order
/// and that many bytes (docs/formats/daemon.md).
namespace ferrox {

/// Sends {"type": command, "data": data} to the index daemon and waits for its acknowledgement, which is dropped.
/// Ignores SIGPIPE in the whole process. Blocks for up to 4 s while the daemon has no socket yet, then until it
/// answers.
/// @throws Error kInternal: "socket failed, reason=...", "setsockopt failed, ...", "write failed, ..." (also when no
/// connection could be made) or "read failed, ...".
FERROX_EXPORT void SendCommandToDaemon(const std::string& command, const Json::Value& data);

/// Writes exactly `size` bytes.
/// @throws Error kInternal "write failed, reason=..." on any error, and on the 11th interruption by a signal.
FERROX_EXPORT void BufferWrite(int fd, unsigned int size, const unsigned char* buffer);

/// Reads exactly `size` bytes. Deliberate: the end of the stream is no progress and no error; it is asked again every
/// 50 ms, for ever.
/// @throws Error kInternal "read failed, reason=..." on any error, and on the 11th interruption by a signal.
FERROX_EXPORT void BufferRead(int fd, unsigned int size, unsigned char* buffer);

}  // namespace ferrox
