#include "services/kovacontentextractd/readers/code_pages.h"

#include <algorithm>
#include <array>
#include <iterator>

#include "services/kovacontentextractd/readers/encoding.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

constexpr std::array<uint16_t, 32> kWindows1252 = {0x20AC, 0x81,   0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021,
                                                   0x02C6, 0x2030, 0x0160, 0x2039, 0x0152, 0x8D,   0x017D, 0x8F,
                                                   0x90,   0x2018, 0x2019, 0x201C, 0x201D, 0x2022, 0x2013, 0x2014,
                                                   0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0x9D,   0x017E, 0x0178};

/// The code pages of Windows (below 10000), of the Macintosh (10000 and on) and of old versions of Excel (32768), and
/// the converter used for each. Where one encoding extends another (GB18030 and GBK, KOI8-U and KOI8-R), it is the
/// wider one.
struct CodePage {
  int number;
  const char* converter;
};
constexpr CodePage kCodePages[] = {
    {437, "IBM850"},       // DOS, United States
    {850, "IBM850"},       // DOS, Western
    {852, "IBM852"},       // DOS, Central European
    {855, "IBM855"},       // DOS, Cyrillic
    {866, "IBM866"},       // DOS, Russian
    {874, "WINDOWS-874"},  // Thai
    {932, "CP932"},        // Japanese
    {936, "GB18030"},      // Chinese, simplified
    {949, "UHC"},          // Korean
    {950, "BIG5-HKSCS"},   // Chinese, traditional
    {1361, "JOHAB"},       // Korean, by letters
    {10000, "MACINTOSH"}, {10001, "CP932"},   {10002, "BIG5-HKSCS"}, {10003, "UHC"}, {10007, "MAC-CYRILLIC"},
    {10008, "GB18030"},   {20866, "KOI8-U"},  // Russian
    {21866, "KOI8-U"},                        // Ukrainian
    {32768, "MACINTOSH"}, {54936, "GB18030"},
};

/// The converter for a code page; "" when there is none.
std::string ConverterFor(int code_page) {
  if (code_page >= 1250 && code_page <= 1258) return "WINDOWS-" + std::to_string(code_page);
  const auto* found = std::find_if(std::begin(kCodePages), std::end(kCodePages),
                                   [&](const CodePage& page) { return page.number == code_page; });
  return found == std::end(kCodePages) ? std::string() : found->converter;
}

}  // namespace

uint32_t FromWindows1252(unsigned char byte) { return byte >= 0x80 && byte < 0xA0 ? kWindows1252[byte - 0x80U] : byte; }

std::string FromCodePage(std::string_view bytes, int code_page) {
  constexpr int kUtf8 = 65001, kUtf16 = 1200;
  if (code_page == kUtf16) return FromUtf16Little(bytes);
  const bool ascii = std::none_of(bytes.begin(), bytes.end(), [](char c) { return (c & 0x80) != 0; });
  if (ascii || (code_page == kUtf8 && IsUtf8(bytes, false))) return std::string(bytes);
  const std::string name = ConverterFor(code_page);
  DecodedText decoded;
  if (!name.empty() && code_page != 1252 && Decode(bytes, true, name, decoded)) return decoded.text;
  std::string out;
  while (!bytes.empty()) {
    const auto* other = std::find_if(bytes.begin(), bytes.end(), [](char c) { return (c & 0x80) != 0; });
    out.append(bytes.begin(), other);
    bytes.remove_prefix(static_cast<size_t>(other - bytes.begin()));
    if (bytes.empty()) break;
    AppendUtf8(out, FromWindows1252(static_cast<unsigned char>(bytes.front())));
    bytes.remove_prefix(1);
  }
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
