#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace ferrox::engine {

/// The single words under which documents have numbers, dates and codes such as "AB-1234/5", however the text of a
/// condition separates or groups them; none where it has no such thing.
std::vector<std::string> JoinedCodes(std::string_view text);

}  // namespace ferrox::engine
