#pragma once

#include <string>
#include <vector>

namespace base {

/// What is left out, as somebody has written it: two lists of patterns in gitignore's syntax (base/ignore_patterns.h).
struct PatternLists {
  std::vector<std::string> exclude;          ///< not at all
  std::vector<std::string> exclude_content;  ///< by name only

  bool Empty() const { return exclude.empty() && exclude_content.empty(); }
  bool operator==(const PatternLists&) const = default;
};

}  // namespace base
