#pragma once

#include <algorithm>
#include <string_view>

#include "base/text.h"

/// Which bytes HTML and XML take for blanks and which for parts of names. All of the characters outside ASCII count as
/// letters of names: XML allows fewer, which does not matter where a document is read as far as it goes.
namespace ferrox::extract {

inline bool IsXmlBlank(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }
inline bool IsHtmlBlank(char c) { return IsXmlBlank(c) || c == '\f'; }

inline bool IsMarkupLetter(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }

inline bool IsMarkupNameByte(char c) {
  return IsMarkupLetter(c) || (c >= '0' && c <= '9') || c == '-' || c == '_' || c == ':' || c == '.' || (c & 0x80) != 0;
}

/// Whether `text` begins with `lower_prefix`, which is in lower case, in any case of ASCII letters.
inline bool StartsWithNoCase(std::string_view text, std::string_view lower_prefix) {
  if (text.size() < lower_prefix.size()) return false;
  return std::equal(lower_prefix.begin(), lower_prefix.end(), text.begin(),
                    [](char wanted, char c) { return wanted == base::LowerAscii(c); });
}

}  // namespace ferrox::extract
