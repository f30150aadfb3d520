#include "services/kovacontentextractd/readers/code_pages.h"

#include <algorithm>
#include <array>

#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

constexpr std::array<uint16_t, 32> kWindows1252 = {0x20AC, 0x81,   0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021,
                                                   0x02C6, 0x2030, 0x0160, 0x2039, 0x0152, 0x8D,   0x017D, 0x8F,
                                                   0x90,   0x2018, 0x2019, 0x201C, 0x201D, 0x2022, 0x2013, 0x2014,
                                                   0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0x9D,   0x017E, 0x0178};

std::string NameOf(int code_page) {
  switch (code_page) {
    case 437:
    case 850:
      return "IBM850";
    case 852:
      return "IBM852";
    case 855:
      return "IBM855";
    case 866:
      return "IBM866";
    case 874:
      return "WINDOWS-874";
    case 932:
      return "CP932";
    case 936:
    case 54936:
      return "GB18030";
    case 949:
      return "UHC";
    case 950:
      return "BIG5-HKSCS";
    case 1361:
      return "JOHAB";
    case 10000:
    case 32768:
      return "MACINTOSH";
    case 10001:
      return "CP932";
    case 10002:
      return "BIG5-HKSCS";
    case 10003:
      return "UHC";
    case 10008:
      return "GB18030";
    case 10007:
      return "MAC-CYRILLIC";
    case 20866:
    case 21866:
      return "KOI8-U";
    default:
      return code_page >= 1250 && code_page <= 1258 ? "WINDOWS-" + std::to_string(code_page) : std::string();
  }
}

}  // namespace

uint32_t FromWindows1252(unsigned char byte) { return byte >= 0x80 && byte < 0xA0 ? kWindows1252[byte - 0x80U] : byte; }

std::string FromCodePage(std::string_view bytes, int code_page) {
  constexpr int kUtf8 = 65001, kUtf16 = 1200;
  if (code_page == kUtf16) return FromUtf16Little(bytes);
  const bool ascii = std::none_of(bytes.begin(), bytes.end(), [](char c) { return (c & 0x80) != 0; });
  if (ascii || (code_page == kUtf8 && IsUtf8(bytes, false))) return std::string(bytes);
  const std::string name = NameOf(code_page);
  DecodedText decoded;
  if (!name.empty() && code_page != 1252 && Decode(bytes, true, name, decoded)) return decoded.text;
  std::string out;
  for (const char c : bytes) AppendUtf8(out, FromWindows1252(static_cast<unsigned char>(c)));
  return out;
}

std::string FromUtf16Little(std::string_view bytes) {
  const auto unit = [&](size_t i) {
    const auto low = static_cast<unsigned char>(bytes[i]), high = static_cast<unsigned char>(bytes[i + 1]);
    return static_cast<uint32_t>(high << 8 | low);
  };
  std::string out;
  for (size_t i = 0; i + 2 <= bytes.size(); i += 2) {
    uint32_t code = unit(i);
    if (code >= 0xD800 && code <= 0xDBFF && i + 4 <= bytes.size() && (unit(i + 2) & 0xFC00) == 0xDC00) {
      code = 0x10000 + ((code & 0x3FF) << 10) + (unit(i + 2) & 0x3FF);
      i += 2;
    }
    AppendUtf8(out, code);
  }
  return out;
}

}  // namespace ferrox::extract
