#pragma once

#include <string>
#include <vector>

namespace ferrox::cli {

/// Takes "--root DIR" from the front of the words, as often as it stands there, and makes that the instance's root.
/// @throws UsageError.
void TakeRoot(std::vector<std::string>& words);

}  // namespace ferrox::cli
