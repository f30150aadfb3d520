#pragma once

#include <string>
#include <vector>

#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// Stray documents lie where nothing of the share is indexed: those of before the share was renamed or moved, or of a
/// folder that was indexed once.

/// The path of the first document that lies neither at nor below one of the folders, none of which lies in another; ""
/// when there is none. Skips over whole folders: at most three requests to the index for each.
std::string FindStray(ShareIndex& index, const std::vector<std::string>& folders);

/// The shallowest folder at or above a path outside of `root` that does not hold `root`, so that all in it lies
/// outside.
std::string TopOutside(const std::string& path, const std::string& root);

}  // namespace ferrox::indexd
