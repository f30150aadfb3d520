#pragma once

#include <string>
#include <vector>

namespace ferrox::cli {

/// Takes "--root DIR" or "--root=DIR" from the front of the words, the last one counting where there are several, and
/// makes that the instance's root: the environment variable FERROX_ROOT of this process and of the daemons that it
/// starts. Nothing may have asked for the root before, since it is read once.
/// @throws UsageError.
void TakeRoot(std::vector<std::string>& words);

}  // namespace ferrox::cli
