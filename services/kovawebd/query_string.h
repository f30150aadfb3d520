#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace ferrox::web {

/// The target of a request line, taken apart.
struct Target {
  std::string path;                                             ///< as it came: no path here has to be escaped
  std::vector<std::pair<std::string, std::string>> parameters;  ///< decoded, in their order
};

/// @throws Problem 400 for what is not "/path?name=value&...": another form of target, "%" without two digits, a zero
/// byte, more than 64 parameters.
Target ReadTarget(std::string_view target);

}  // namespace ferrox::web
