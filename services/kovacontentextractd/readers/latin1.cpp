#include "services/kovacontentextractd/readers/latin1.h"

#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

/// The bytes that were taken for Latin-1 to become `text`. False when it has other characters.
bool Latin1Bytes(std::string_view text, std::string& bytes) {
  for (size_t i = 0; i < text.size(); ++i) {
    const auto lead = static_cast<unsigned char>(text[i]);
    if (lead >= 0x80 && (lead > 0xC3 || i + 1 == text.size())) return false;
    bytes += lead < 0x80 ? text[i] : static_cast<char>((lead & 0x03) << 6 | (text[++i] & 0x3F));
  }
  return true;
}

}  // namespace

std::string Utf8OrLatin1(std::string_view bytes) {
  if (IsUtf8(bytes, false)) return std::string(bytes);
  std::string out;
  for (const char c : bytes) AppendUtf8(out, static_cast<unsigned char>(c));
  return out;
}

std::string WithoutDoubleEncoding(std::string text) {
  std::string bytes;
  return Latin1Bytes(text, bytes) && IsUtf8(bytes, false) ? bytes : text;
}

std::string TrueEncoding(std::string_view texts) {
  // Fewer bytes outside ASCII tell nothing, and Latin text has more plain letters than others.
  constexpr size_t kTellingBytes = 6;
  std::string bytes;
  if (!Latin1Bytes(texts, bytes)) return {};
  size_t high = 0, letters = 0;
  for (const char c : bytes) {
    if ((c & 0x80) != 0) ++high;
    if ((c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z')) ++letters;
  }
  DecodedText decoded;
  if (high < kTellingBytes || high < letters || !Decode(bytes, false, {}, decoded)) return {};
  return decoded.encoding.substr(0, decoded.encoding.find(" (guess)"));
}

std::string InTrueEncoding(std::string text, const std::string& encoding) {
  std::string bytes;
  DecodedText decoded;
  return Latin1Bytes(text, bytes) && Decode(bytes, false, encoding, decoded) ? decoded.text : text;
}

}  // namespace ferrox::extract
