#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace kova {

/// The plain text of a field of /proc/self/mountinfo. The kernel separates the fields by blanks and writes blanks,
/// tabs, newlines and backslashes within them as a backslash and three octal digits: "\040" is a blank. A backslash
/// that less than three characters follow stays as it is. The field must come from the kernel: the digits are not
/// checked. PlainMountField("/mnt/my\\040disk") is "/mnt/my disk".
///
/// Only the fields of texts need it: the root within the file system, the mount point, the source. What stays undone
/// shows late: a path of the table that holds a blank equals no path that a program was given. Touches no file, and may
/// be called by any thread.
inline std::string PlainMountField(std::string_view field) {
  std::string plain;
  for (size_t i = 0; i < field.size(); ++i) {
    if (field[i] == '\\' && i + 3 < field.size()) {
      // Three digits make one byte; those of a character of several bytes are joined by being appended in turn.
      plain += static_cast<char>((field[i + 1] - '0') * 64 + (field[i + 2] - '0') * 8 + (field[i + 3] - '0'));
      i += 3;
    } else {
      plain += field[i];
    }
  }
  return plain;
}

}  // namespace kova
