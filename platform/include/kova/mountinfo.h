#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace kova {

/// A field of /proc/self/mountinfo, in which blanks, tabs, newlines and backslashes stand as "\040" and so on.
inline std::string PlainMountField(std::string_view field) {
  std::string plain;
  for (size_t i = 0; i < field.size(); ++i) {
    if (field[i] == '\\' && i + 3 < field.size()) {
      plain += static_cast<char>((field[i + 1] - '0') * 64 + (field[i + 2] - '0') * 8 + (field[i + 3] - '0'));
      i += 3;
    } else {
      plain += field[i];
    }
  }
  return plain;
}

}  // namespace kova
