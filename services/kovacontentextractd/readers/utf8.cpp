#include "services/kovacontentextractd/readers/utf8.h"

#include <algorithm>
#include <cstring>

namespace ferrox::extract {

namespace {

/// The length of the valid character at `p`, 0 when there is none. Overlong forms, surrogates and what lies beyond
/// U+10FFFF are not valid.
size_t CharacterLength(const unsigned char* p, size_t left) {
  const unsigned char lead = *p;
  if (lead < 0x80) return 1;
  size_t length;
  unsigned char low = 0x80, high = 0xBF;  // what the second byte may be
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    if (lead == 0xE0) low = 0xA0;
    if (lead == 0xED) high = 0x9F;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    if (lead == 0xF0) low = 0x90;
    if (lead == 0xF4) high = 0x8F;
  } else {
    return 0;
  }
  if (left < length || p[1] < low || p[1] > high) return 0;
  for (size_t i = 2; i < length; ++i) {
    if ((p[i] & 0xC0) != 0x80) return 0;
  }
  return length;
}

}  // namespace

size_t ValidUtf8Prefix(std::string_view text) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
  size_t at = 0;
  while (at < text.size()) {
    uint64_t eight;
    while (text.size() - at >= sizeof(eight)) {  // most text is ASCII for long stretches
      memcpy(&eight, bytes + at, sizeof(eight));
      if ((eight & UINT64_C(0x8080808080808080)) != 0) break;
      at += sizeof(eight);
    }
    if (at == text.size()) break;
    const size_t length = CharacterLength(bytes + at, text.size() - at);
    if (length == 0) break;
    at += length;
  }
  return at;
}

bool IsUtf8(std::string_view text, bool cut) {
  const size_t valid = ValidUtf8Prefix(text);
  if (valid == text.size()) return true;
  const size_t rest = text.size() - valid;
  const auto lead = static_cast<unsigned char>(text[valid]);
  if (!cut || rest > 3 || lead < 0xC2 || lead > 0xF4) return false;
  const size_t wanted = lead < 0xE0 ? 2 : lead < 0xF0 ? 3 : 4;
  return rest < wanted && std::all_of(text.begin() + static_cast<ptrdiff_t>(valid) + 1, text.end(),
                                      [](char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; });
}

std::string_view CutAtCharacter(std::string_view text, size_t limit_bytes) {
  if (text.size() <= limit_bytes) return text;
  size_t end = limit_bytes;
  while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0) == 0x80) --end;
  return text.substr(0, end);
}

void AppendUtf8(std::string& out, uint32_t code_point) {
  if (code_point > 0x10FFFF || (code_point >= 0xD800 && code_point <= 0xDFFF)) code_point = 0xFFFD;
  if (code_point < 0x80) {
    out += static_cast<char>(code_point);
  } else if (code_point < 0x800) {
    out += static_cast<char>(0xC0 | (code_point >> 6));
    out += static_cast<char>(0x80 | (code_point & 0x3F));
  } else if (code_point < 0x10000) {
    out += static_cast<char>(0xE0 | (code_point >> 12));
    out += static_cast<char>(0x80 | ((code_point >> 6) & 0x3F));
    out += static_cast<char>(0x80 | (code_point & 0x3F));
  } else {
    out += static_cast<char>(0xF0 | (code_point >> 18));
    out += static_cast<char>(0x80 | ((code_point >> 12) & 0x3F));
    out += static_cast<char>(0x80 | ((code_point >> 6) & 0x3F));
    out += static_cast<char>(0x80 | (code_point & 0x3F));
  }
}

}  // namespace ferrox::extract
