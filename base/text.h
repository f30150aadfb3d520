#pragma once

#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>

/// Texts in UTF-8, and what of them may be shown as it is: names and contents are bytes that somebody else has chosen.
/// All of these may be called by any thread, and none depends on the locale.
namespace base {

/// The number of bytes (1 to 4) of the UTF-8 character that `text` begins with, 0 when it begins with none, as an empty
/// text or one that is cut off within a character. As Unicode defines it: no overlong forms, no surrogates, nothing
/// beyond U+10FFFF.
inline size_t CharacterBytes(std::string_view text) {
  if (text.empty()) return 0;
  const auto byte = [&text](size_t at) { return static_cast<unsigned char>(text[at]); };
  const unsigned char first = byte(0);
  if (first < 0x80) return 1;
  const size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
  // 80 to BF continue a character, C0 and C1 could begin overlong forms only, F5 and above what is no code point.
  if (first < 0xC2 || first > 0xF4 || text.size() < length) return 0;
  for (size_t i = 1; i < length; ++i) {
    if ((byte(i) & 0xC0) != 0x80) return 0;
  }
  // Overlong forms, surrogates, and what lies beyond the last character.
  const unsigned char second = byte(1);
  const bool refused = (first == 0xE0 && second < 0xA0) || (first == 0xED && second > 0x9F) ||
                       (first == 0xF0 && second < 0x90) || (first == 0xF4 && second > 0x8F);
  return refused ? 0 : length;
}

/// The code point of a character that is a control, whether a terminal obeys it (C0, DEL, the C1 controls, the breaks
/// of lines and paragraphs) or it turns the direction of what stands around it, so that a name can look like another;
/// -1 for any other character. `character` is one whole UTF-8 character, as CharacterBytes measures it; this is not
/// checked again.
inline int ControlCodePoint(std::string_view character) {
  const auto low = [&character](size_t at) { return character[at] & 0x3F; };
  const auto first = static_cast<unsigned char>(character[0]);
  if (character.size() == 1) return first < 0x20 || first == 0x7F ? first : -1;
  if (character.size() > 3) return -1;  // none of them lies beyond U+FFFF
  const int code = character.size() == 2 ? (first & 0x1F) << 6 | low(1) : (first & 0x0F) << 12 | low(1) << 6 | low(2);
  // C1; Arabic letter mark; marks of direction; line and paragraph breaks with embeddings and overrides; isolates.
  const bool control = code < 0xA0 || code == 0x61C || code == 0x200E || code == 0x200F ||
                       (code >= 0x2028 && code <= 0x202E) || (code >= 0x2066 && code <= 0x2069);
  return control ? code : -1;
}

/// The text with each byte of a control, and each that is not part of valid UTF-8, in the form of `format`, that takes
/// an unsigned number ("\\x%02x"; at most 7 bytes); controls that are in `kept` (UTF-8) stay. The result is valid
/// UTF-8. A newline in a file's name is then "\x0a", and a character of three bytes that turns the direction three such
/// forms. The result cannot be turned back: a backslash of the text itself stays as it is.
inline std::string WithoutControls(std::string_view text, const char* format, std::string_view kept = {}) {
  std::string out;
  out.reserve(text.size());
  while (!text.empty()) {
    const size_t length = CharacterBytes(text);
    // What is no character is taken byte by byte, so that a character right behind it is not lost.
    const std::string_view taken = text.substr(0, length == 0 ? 1 : length);
    if (length != 0 && (ControlCodePoint(taken) < 0 || kept.find(taken) != kept.npos)) {
      out += taken;
    } else {
      for (const char byte : taken) {
        char escaped[8];
        (void)snprintf(escaped, sizeof(escaped), format, static_cast<unsigned>(static_cast<unsigned char>(byte)));
        out += escaped;
      }
    }
    text.remove_prefix(taken.size());
  }
  return out;
}

/// A-Z to a-z, whatever the locale; any other byte stays.
inline char LowerAscii(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }
inline std::string LowerAscii(std::string text) {
  for (char& c : text) c = LowerAscii(c);
  return text;
}

/// Appends a code point as UTF-8; what is none (beyond U+10FFFF, a surrogate) as U+FFFD.
inline void AppendUtf8(std::string& out, uint32_t code_point) {
  if (code_point < 0x80) {
    out += static_cast<char>(code_point);
    return;
  }
  if (code_point > 0x10FFFF || (code_point >= 0xD800 && code_point <= 0xDFFF)) code_point = 0xFFFD;
  const int tail = code_point < 0x800 ? 1 : code_point < 0x10000 ? 2 : 3;
  // The first byte's high bits say how many bytes follow; each of those has 6 bits of the code point.
  constexpr unsigned char kLead[] = {0, 0xC0, 0xE0, 0xF0};
  out += static_cast<char>(kLead[tail] | (code_point >> (6 * tail)));
  for (int i = tail - 1; i >= 0; --i) out += static_cast<char>(0x80 | ((code_point >> (6 * i)) & 0x3F));
}

}  // namespace base
