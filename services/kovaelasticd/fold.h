#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace ferrox::engine {

/// What a character means for the splitting of text into words.
enum class CharClass : uint8_t {
  kSeparator,  ///< ends a word
  kMark,       ///< an accent on its own: as if it were not there
  kLetter,     ///< part of a word
  kPaired,     ///< of a script without blanks between words: indexed in pairs
};

/// One character of a text. A byte that is not part of valid UTF-8 is read as Latin-1, so that names in that encoding
/// are found too.
struct CodePoint {
  uint32_t value;
  uint32_t length_bytes;
};

/// Decodes the character at `pos`, which must lie within `text`. A base character and its sound mark or the parts of a
/// Korean syllable, as some systems write them, are one.
CodePoint DecodeAt(std::string_view text, size_t pos);

void AppendUtf8(std::string& out, uint32_t code_point);

/// Appends the folded form of a letter (no case, no accent; up to two letters) or of a paired character to `folded`.
/// Nothing is appended for the other classes.
CharClass FoldTo(std::string& folded, uint32_t code_point);

/// The whole text with every letter folded and accents removed; what is no letter stays.
std::string FoldText(std::string_view text);

}  // namespace ferrox::engine
