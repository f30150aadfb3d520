#pragma once

#include <cstdio>
#include <string>
#include <string_view>

namespace kova {

/// The text with each control character as \xNN, so that no file name can forge a line of the log.
inline std::string WithoutControlCharacters(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte >= 0x20 && byte != 0x7f) {
      out += c;
    } else {
      char escaped[5];
      (void)snprintf(escaped, sizeof(escaped), "\\x%02x", static_cast<unsigned>(byte));
      out += escaped;
    }
  }
  return out;
}

}  // namespace kova
