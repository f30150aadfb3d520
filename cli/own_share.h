#pragma once

#include <string>

#include "platform/host/share_table.h"

namespace ferrox::cli {

/// Shares come from two tables: that of the host, which the tool changes, and that of the file-sharing service, which
/// only it changes.

/// Whether either has a share of that name. @throws Error kShareEnumFailed.
bool IsShare(const std::string& name);

/// The entry of a share of the host's own table, which the tool changes. @throws Error kNoSuchShare; Failure when the
/// table cannot be used, or when the share is Samba's: then that `verb` ("rename") is to be done there.
kova::host::ShareEntry OwnShare(const std::string& name, const std::string& verb);

}  // namespace ferrox::cli
