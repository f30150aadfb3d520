#pragma once

#include <optional>
#include <string>
#include <vector>

namespace kova::host {

/// What `kova-accounts` writes for these arguments; nothing, with a line in the log, when it fails or needs more than
/// 5 s: it is killed then. Blocks meanwhile.
std::optional<std::string> LookUpAccount(const std::vector<std::string>& arguments);

}  // namespace kova::host
