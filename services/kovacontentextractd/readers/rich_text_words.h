#pragma once

#include <cstdint>
#include <string_view>

namespace ferrox::extract {

/// What the control words of RTF mean, of those that have to do with text. All lookups are by the word without its "\"
/// and number; case counts.

/// Where the text of a group goes.
enum class RichTextTarget : uint8_t { kText, kNowhere, kFontTable, kField };

/// A control word that makes its group a destination.
struct RichTextDestination {
  std::string_view word;
  RichTextTarget target;
  const char* field = nullptr;  ///< of kField
};

/// Null for a word that makes none, or one that is not known.
const RichTextDestination* FindRichTextDestination(std::string_view word);

/// The character that a control word stands for ("emdash"), 0 when it stands for none.
uint32_t RichTextCharacter(std::string_view word);

/// The number that names Mac OS Roman among the code pages.
inline constexpr int kMacRomanCodePage = 10000;

/// The code page of a font's character set ("\fcharset"); 0 for one that is not known.
int CodePageOfCharset(int charset);

}  // namespace ferrox::extract
