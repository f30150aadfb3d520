#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "base/text.h"

namespace ferrox::extract {

/// How many bytes at the beginning of `text` are valid UTF-8: all of them when it is. Ends at the first bad byte, so
/// that a text with many of them can be gone through piece by piece in linear time.
size_t ValidUtf8Prefix(std::string_view text);

/// Whether `text` is valid UTF-8 but for a last character that is cut off, which counts only when `cut`.
bool IsUtf8(std::string_view text, bool cut);

/// The longest prefix of valid UTF-8 of at most `limit_bytes` that ends at a character's border.
std::string_view CutAtCharacter(std::string_view text, size_t limit_bytes);

using base::AppendUtf8;

}  // namespace ferrox::extract
