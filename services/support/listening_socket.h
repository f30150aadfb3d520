#pragma once

#include <sys/types.h>

#include <string>

#include "base/unique_fd.h"
#include "services/support/frame_server.h"

namespace ferrox::services {

/// A Unix-domain socket that listens at `path`, whose file gets the given mode. It does not block. A file left by a
/// dead process is replaced; one that answers is not.
/// @throws Error kInternal, with the path and what to do.
base::UniqueFd Listen(const std::string& path, mode_t mode);

/// Who is at the other end of a connection; of uid -1 when the kernel does not say.
Peer PeerOf(int fd);

}  // namespace ferrox::services
