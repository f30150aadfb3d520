#pragma once

#include <string>
#include <vector>

#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// The first document that lies neither at nor below one of the folders, none of which lies in another; "" when there
/// is none. Asks the index about three things a folder at most.
std::string FindStray(ShareIndex& index, const std::vector<std::string>& folders);

/// The shallowest folder at or above a path outside of `root` that does not hold `root`, so that all in it lies
/// outside.
std::string TopOutside(const std::string& path, const std::string& root);

}  // namespace ferrox::indexd
