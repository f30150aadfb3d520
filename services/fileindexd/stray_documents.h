#pragma once

#include <string>

#include "services/fileindexd/share_index.h"

namespace ferrox::indexd {

/// A document that does not lie below the share's folder `root`, "" when there is none. After the share was renamed or
/// moved, all of them are such until the rename is carried out. Asks the index three things at most.
std::string FindStray(ShareIndex& index, const std::string& root);

/// The shallowest folder at or above the stray that does not hold `root`, so that all in it are strays; "" when the
/// stray itself holds it.
std::string FolderOfStrays(const std::string& stray, const std::string& root);

}  // namespace ferrox::indexd
