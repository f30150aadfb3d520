#include "services/kovacontentextractd/readers/latin1.h"

#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

std::string Utf8OrLatin1(std::string_view bytes) {
  if (IsUtf8(bytes, false)) return std::string(bytes);
  std::string out;
  for (const char c : bytes) AppendUtf8(out, static_cast<unsigned char>(c));
  return out;
}

std::string WithoutDoubleEncoding(std::string text) {
  std::string bytes;
  for (size_t i = 0; i < text.size(); ++i) {
    const auto lead = static_cast<unsigned char>(text[i]);
    if (lead >= 0x80 && (lead > 0xC3 || i + 1 == text.size())) return text;  // not a character of Latin-1
    bytes += lead < 0x80 ? text[i] : static_cast<char>((lead & 0x03) << 6 | (text[++i] & 0x3F));
  }
  return IsUtf8(bytes, false) ? bytes : text;
}

}  // namespace ferrox::extract
