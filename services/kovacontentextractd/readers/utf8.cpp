#include "services/kovacontentextractd/readers/utf8.h"

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>

#include "services/kovacontentextractd/readers/utf8_blocks.h"

namespace ferrox::extract {

namespace {

/// How many bytes at the beginning are ASCII. Most text is, for long stretches.
size_t AsciiPrefix(const unsigned char* bytes, size_t size) {
  size_t at = 0;
  for (uint64_t eight; size - at >= sizeof(eight); at += sizeof(eight)) {
    memcpy(&eight, bytes + at, sizeof(eight));
    const uint64_t others = eight & UINT64_C(0x8080808080808080);
    if (others == 0) continue;
    const int bits = std::endian::native == std::endian::little ? std::countr_zero(others) : std::countl_zero(others);
    return at + static_cast<size_t>(bits) / 8;
  }
  while (at < size && bytes[at] < 0x80) ++at;
  return at;
}

bool Continues(unsigned char byte) { return (byte & 0xC0) == 0x80; }

/// The length of the valid character beyond ASCII at `p`, 0 when there is none. Overlong forms, surrogates and what
/// lies beyond U+10FFFF are not valid.
size_t CharacterLength(const unsigned char* p, size_t left) {
  const unsigned char lead = *p;
  if (lead < 0xC2 || left < 2 || !Continues(p[1])) return 0;
  if (lead < 0xE0) return 2;
  if (left < 3 || !Continues(p[2])) return 0;
  const unsigned first_bits = (static_cast<unsigned>(lead) << 8) | p[1];
  if (lead < 0xF0) return first_bits >= 0xE0A0 && (first_bits < 0xEDA0 || lead > 0xED) ? 3 : 0;
  const bool whole = left >= 4 && Continues(p[3]);
  return whole && first_bits >= 0xF090 && first_bits < 0xF490 ? 4 : 0;
}

/// How many bytes at the beginning are valid.
size_t ValidBytes(const unsigned char* bytes, size_t size) {
  size_t at = AsciiPrefix(bytes, size);
  while (at < size) {
    do {  // where one is beyond ASCII, others follow
      const size_t length = CharacterLength(bytes + at, size - at);
      if (length == 0) return at;
      at += length;
    } while (at < size && bytes[at] >= 0x80);
    at += AsciiPrefix(bytes + at, size - at);
  }
  return at;
}

}  // namespace

/// Whole blocks by the processor's vector instructions, the rest, and what these refuse, byte by byte.
size_t ValidUtf8Prefix(std::string_view text) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(text.data());
  const size_t checked = ValidUtf8Blocks(bytes, text.size());
  return checked + ValidBytes(bytes + checked, text.size() - checked);
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

}  // namespace ferrox::extract
