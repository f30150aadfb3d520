#pragma once

#include <string>

#include "platform/host/share_table.h"

namespace ferrox::cli {

bool IsShare(const std::string& name);

/// The entry of a share of the host's own table, which the tool changes. @throws Error kNoSuchShare; Failure when the
/// table cannot be used, or when the share is Samba's: then that `verb` ("rename") is to be done there.
kova::host::ShareEntry OwnShare(const std::string& name, const std::string& verb);

}  // namespace ferrox::cli
