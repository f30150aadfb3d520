#pragma once

#include <cstdint>
#include <string>
#include <string_view>

/// The engine's own folding of text: an index word has no case and no accents, so that "Résumé", "RESUME" and "resume"
/// find each other. Foldings and classes are part of the index format: a change of either makes words of older indices
/// unfindable (tests/engine/words_test.cpp holds all of them).
namespace ferrox::engine {

/// What a character means where text is split into words.
enum class CharClass : uint8_t {
  kSeparator,  ///< ends a word
  kMark,       ///< an accent on its own, a joiner: skipped
  kLetter,     ///< part of a word
  kPaired,     ///< of a script without blanks between words: indexed in pairs
};

/// One character of a text. A byte that is not part of valid UTF-8 is read as Latin-1, so that names in that encoding
/// are found too.
struct CodePoint {
  uint32_t value;
  uint32_t length_bytes;
};

/// Decodes the character at `pos`, which must lie within `text`. A kana and its separate sound mark, or the two or
/// three parts of a Korean syllable (both are how macOS writes file names), are decoded as the one composed character;
/// narrow kana as those of usual width.
CodePoint DecodeAt(std::string_view text, size_t pos);

/// Appends the folded form of a letter (no case, no accent; up to two letters, "ss" for a sharp s) or of a paired
/// character to `folded`. Nothing is appended for the other classes.
/// @return the character's class.
CharClass FoldTo(std::string& folded, uint32_t code_point);

/// The whole text with every letter folded and accents removed; what is no letter stays.
std::string FoldText(std::string_view text);

}  // namespace ferrox::engine
