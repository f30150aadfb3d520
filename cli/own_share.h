#pragma once

#include <string>

#include "platform/host/share_table.h"

namespace ferrox::cli {

bool IsShare(const std::string& name);

/// The entry of a share of the host's own table, which the tool changes. @throws Error kNoSuchShare; Failure when the
/// table cannot be used, or when the share is Samba's: then that `verb` ("rename") is to be done there.
kova::host::ShareEntry OwnShare(const std::string& name, const std::string& verb);

/// Removes the queue of a share that is no longer there, with what the index daemon keeps beside it. Missing files, and
/// failures, do not matter: what is left is not looked at until a share is there again.
void RemoveQueue(const std::string& queue_path);

}  // namespace ferrox::cli
