#pragma once

#include <string>
#include <string_view>

#include "base/text.h"

namespace kova {

/// For one line of a log.
/// The text with each control character as \xNN, so that no file name can forge a line of the log or steer the terminal
/// that shows it; and so each byte that is not UTF-8.
inline std::string WithoutControlCharacters(std::string_view text) { return base::WithoutControls(text, "\\x%02x"); }

}  // namespace kova
