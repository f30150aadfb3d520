#include "services/kovaelasticd/text/fold.h"

#include <iterator>

#include "base/text.h"

namespace ferrox::engine {

namespace {

/// A block of Unicode whose characters are folded by a table, one entry for each code point from `first` to `last`.
struct FoldBlock {
  uint32_t first;
  uint32_t last;
  const uint16_t* folded;
};
#include "services/kovaelasticd/text/fold_tables.inc"  // kBlocks, kExpansionBase, kExpansions

/// Code points that all mean the same for the splitting into words.
struct Range {
  uint32_t first;
  uint32_t last;
  CharClass char_class;
};
/// What is no letter outside of the tables' blocks, in order; all the rest from U+0250 on is a letter. By blocks, not
/// by the categories of a version of Unicode: a character that a later version adds means the same in old indices. The
/// comments name what a range holds.
constexpr Range kRanges[] = {
    {0x0300, 0x036F, CharClass::kMark},       // combining accents
    {0x0589, 0x058F, CharClass::kSeparator},  // Armenian punctuation
    {0x0591, 0x05BD, CharClass::kMark},       // Hebrew points
    {0x05BE, 0x05C0, CharClass::kSeparator},  //
    {0x05C1, 0x05C7, CharClass::kMark},       //
    {0x0600, 0x060F, CharClass::kSeparator},  // Arabic punctuation
    {0x0610, 0x061A, CharClass::kMark},       //
    {0x061B, 0x061F, CharClass::kSeparator},  //
    {0x0640, 0x0640, CharClass::kMark},       // the stretching stroke
    {0x064B, 0x065F, CharClass::kMark},       // Arabic vowels
    {0x066A, 0x066D, CharClass::kSeparator},  //
    {0x0964, 0x0965, CharClass::kSeparator},  // Indic full stops
    {0x0E00, 0x0EFF, CharClass::kPaired},     // Thai, Lao
    {0x1000, 0x109F, CharClass::kPaired},     // Burmese
    {0x1780, 0x17FF, CharClass::kPaired},     // Khmer
    {0x1AB0, 0x1AFF, CharClass::kMark},       //
    {0x1DC0, 0x1DFF, CharClass::kMark},       //
    {0x2000, 0x200A, CharClass::kSeparator},  // blanks
    {0x200B, 0x200F, CharClass::kMark},       // joiners and direction marks
    {0x2010, 0x2029, CharClass::kSeparator},  //
    {0x202A, 0x202E, CharClass::kMark},       //
    {0x202F, 0x205F, CharClass::kSeparator},  //
    {0x2060, 0x206F, CharClass::kMark},       //
    {0x20A0, 0x20CF, CharClass::kSeparator},  // currencies
    {0x20D0, 0x20FF, CharClass::kMark},       //
    {0x2190, 0x25FF, CharClass::kSeparator},  // arrows, mathematics, boxes
    {0x2600, 0x27BF, CharClass::kPaired},     // pictures
    {0x27C0, 0x2BFF, CharClass::kSeparator},  //
    {0x2E00, 0x2E7F, CharClass::kSeparator},  //
    {0x2E80, 0x2FDF, CharClass::kPaired},     // radicals
    {0x3000, 0x3004, CharClass::kSeparator},  // ideographic punctuation
    {0x3005, 0x3007, CharClass::kPaired},     //
    {0x3008, 0x3020, CharClass::kSeparator},  //
    {0x3021, 0x30FA, CharClass::kPaired},     // kana
    {0x30FB, 0x30FB, CharClass::kSeparator},  // the middle dot between words
    {0x30FC, 0x9FFF, CharClass::kPaired},     // kana, ideographs
    {0xAC00, 0xD7AF, CharClass::kPaired},     // Korean syllables
    {0xE000, 0xF8FF, CharClass::kSeparator},  // private use
    {0xF900, 0xFAFF, CharClass::kPaired},     //
    {0xFE00, 0xFE2F, CharClass::kMark},       // variation selectors
    {0xFE30, 0xFE6F, CharClass::kSeparator},  //
    {0xFF65, 0xFFDC, CharClass::kPaired},     // narrow kana and jamo
    {0xFFE0, 0xFFFF, CharClass::kSeparator},  //
    {0x1F000, 0x1FAFF, CharClass::kPaired},   // pictures
    {0x20000, 0x3FFFF, CharClass::kPaired},   // ideographs
    {0xE0000, 0x10FFFF, CharClass::kMark},    // tags
};

CharClass ClassOf(uint32_t c) {
  size_t low = 0;
  size_t high = std::size(kRanges);
  while (low < high) {
    const size_t middle = (low + high) / 2;
    if (c > kRanges[middle].last) {
      low = middle + 1;
    } else {
      high = middle;
    }
  }
  return low < std::size(kRanges) && c >= kRanges[low].first ? kRanges[low].char_class : CharClass::kLetter;
}

/// Appends an ASCII letter or digit, in lower case.
CharClass FoldAscii(std::string& folded, uint32_t c) {
  if (c >= 'A' && c <= 'Z') c += 'a' - 'A';
  if ((c < 'a' || c > 'z') && (c < '0' || c > '9')) return CharClass::kSeparator;
  folded += static_cast<char>(c);
  return CharClass::kLetter;
}

/// Appends the form that an entry of a table stands for.
CharClass FoldByTable(std::string& folded, uint16_t to) {
  if (to == 0) return CharClass::kSeparator;
  if (to >= kExpansionBase) {
    folded += kExpansions[to - kExpansionBase];
  } else {
    base::AppendUtf8(folded, to);
  }
  return CharClass::kLetter;
}

bool IsContinuation(std::string_view text, size_t pos) {
  return pos < text.size() && (static_cast<unsigned char>(text[pos]) & 0xC0) == 0x80;
}

/// Strict UTF-8; a length of 0 when the bytes at `pos` are none: overlong forms, surrogates, numbers beyond U+10FFFF
/// and sequences that are cut off.
CodePoint DecodeStrict(std::string_view text, size_t pos) {
  const auto lead = static_cast<unsigned char>(text[pos]);
  if (lead < 0x80) return {lead, 1};
  const uint32_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC2 || lead > 0xF4) return {lead, 0};
  uint32_t value = lead & (0xFFU >> (length + 1));
  for (uint32_t i = 1; i < length; ++i) {
    if (!IsContinuation(text, pos + i)) return {lead, 0};
    value = (value << 6) | (static_cast<unsigned char>(text[pos + i]) & 0x3FU);
  }
  constexpr uint32_t kSmallest[] = {0, 0, 0x80, 0x800, 0x10000};
  const bool surrogate = value >= 0xD800 && value <= 0xDFFF;
  if (value < kSmallest[length] || value > 0x10FFFF || surrogate) return {lead, 0};
  return {value, length};
}

/// As DecodeStrict, but a byte that is not part of valid UTF-8 is the Latin-1 character of its number.
CodePoint DecodeLenient(std::string_view text, size_t pos) {
  const CodePoint decoded = DecodeStrict(text, pos);
  return {decoded.value, decoded.length_bytes == 0 ? 1 : decoded.length_bytes};
}

/// The voiced form of a kana that a separate sound mark follows (U+3099 voiced, U+309A half-voiced); 0 when it has
/// none. In Unicode's order a plain kana stands right before its voiced form, and in the h row both before the
/// half-voiced one: KA GA KI GI ..., HA BA PA HI BI PI ...; the small TU breaks the order of the t row.
uint32_t Voiced(uint32_t kana, uint32_t mark) {
  const uint32_t place = kana >= 0x30A1 ? kana - 0x60 : kana;  // katakana lies 0x60 behind hiragana
  if (mark == 0x309A) return place >= 0x306F && place <= 0x307B && (place - 0x306F) % 3 == 0 ? kana + 2 : 0;
  const bool first_rows = place >= 0x304B && place <= 0x3061 && (place - 0x304B) % 2 == 0;
  const bool rest_of_t = place == 0x3064 || place == 0x3066 || place == 0x3068;
  const bool h_row = place >= 0x306F && place <= 0x307B && (place - 0x306F) % 3 == 0;
  return first_rows || rest_of_t || h_row ? kana + 1 : 0;
}

/// The kana of usual width that the narrow ones U+FF66 .. U+FF9D stand for, as the number of each behind U+3000.
constexpr unsigned char kWideKana[] = {
    0xF2, 0xA1, 0xA3, 0xA5, 0xA7, 0xA9, 0xE3, 0xE5, 0xE7, 0xC3, 0xFC, 0xA2, 0xA4, 0xA6, 0xA8, 0xAA, 0xAB, 0xAD, 0xAF,
    0xB1, 0xB3, 0xB5, 0xB7, 0xB9, 0xBB, 0xBD, 0xBF, 0xC1, 0xC4, 0xC6, 0xC8, 0xCA, 0xCB, 0xCC, 0xCD, 0xCE, 0xCF, 0xD2,
    0xD5, 0xD8, 0xDB, 0xDE, 0xDF, 0xE0, 0xE1, 0xE2, 0xE4, 0xE6, 0xE8, 0xE9, 0xEA, 0xEB, 0xEC, 0xED, 0xEF, 0xF3};

/// The kana `base` at `pos` together with a sound mark behind it, which is dropped where the kana has no such form.
CodePoint ComposeKana(std::string_view text, size_t pos, CodePoint base) {
  const size_t next = pos + base.length_bytes;
  if (next >= text.size()) return base;
  CodePoint mark = DecodeLenient(text, next);
  if (mark.value == 0xFF9E || mark.value == 0xFF9F) mark.value -= 0xFF9E - 0x3099;  // narrow ones
  if (mark.value != 0x3099 && mark.value != 0x309A) return base;
  const uint32_t voiced = Voiced(base.value, mark.value);
  return {voiced == 0 ? base.value : voiced, base.length_bytes + mark.length_bytes};
}

/// A Korean syllable from its leading consonant, vowel and, if there is one, final consonant. Unicode numbers the
/// syllables from U+AC00 on by 19 leading consonants, 21 vowels and 27 final consonants or none.
CodePoint ComposeHangul(std::string_view text, size_t pos, CodePoint lead) {
  size_t next = pos + lead.length_bytes;
  if (next >= text.size()) return lead;
  const CodePoint vowel = DecodeLenient(text, next);
  if (vowel.value < 0x1161 || vowel.value > 0x1175) return lead;
  CodePoint syllable = {0xAC00 + ((lead.value - 0x1100) * 21 + (vowel.value - 0x1161)) * 28,
                        lead.length_bytes + vowel.length_bytes};
  next += vowel.length_bytes;
  if (next >= text.size()) return syllable;
  const CodePoint tail = DecodeLenient(text, next);
  if (tail.value <= 0x11A7 || tail.value > 0x11C2) return syllable;
  return {syllable.value + tail.value - 0x11A7, syllable.length_bytes + tail.length_bytes};
}

}  // namespace

CodePoint DecodeAt(std::string_view text, size_t pos) {
  CodePoint decoded = DecodeLenient(text, pos);
  if (decoded.value >= 0xFF66 && decoded.value <= 0xFF9D) decoded.value = 0x3000U + kWideKana[decoded.value - 0xFF66];
  if (decoded.value >= 0x304B && decoded.value <= 0x30DB) return ComposeKana(text, pos, decoded);
  if (decoded.value >= 0x1100 && decoded.value <= 0x1112) return ComposeHangul(text, pos, decoded);
  return decoded;
}

CharClass FoldTo(std::string& folded, uint32_t c) {
  if (c >= 0xFF01 && c <= 0xFF5E) c -= 0xFF01 - 0x21;  // full-width forms of ASCII
  if (c < 0x80) return FoldAscii(folded, c);
  if (c < 0xA0) return CharClass::kSeparator;
  for (const FoldBlock& block : kBlocks) {
    if (c >= block.first && c <= block.last) return FoldByTable(folded, block.folded[c - block.first]);
  }
  const CharClass char_class = ClassOf(c);
  if (c >= 0x531 && c <= 0x556) c += 0x30;  // Armenian capitals
  if (char_class == CharClass::kLetter || char_class == CharClass::kPaired) base::AppendUtf8(folded, c);
  return char_class;
}

std::string FoldText(std::string_view text) {
  std::string folded;
  folded.reserve(text.size());
  for (size_t pos = 0; pos < text.size();) {
    const CodePoint c = DecodeAt(text, pos);
    pos += c.length_bytes;
    if (FoldTo(folded, c.value) == CharClass::kSeparator) base::AppendUtf8(folded, c.value);
  }
  return folded;
}

}  // namespace ferrox::engine
