#pragma once

#include <algorithm>
#include <string_view>

namespace ferrox::engine {

/// Takes the first line off the text, without its end and the blanks before that.
inline std::string_view TakeLine(std::string_view& text) {
  const size_t end = std::min(text.size(), text.find('\n'));
  const std::string_view line = text.substr(0, end);
  text.remove_prefix(std::min(text.size(), end + 1));
  return line.substr(0, line.find_last_not_of(" \t\r\f\v") + 1);
}

}  // namespace ferrox::engine
