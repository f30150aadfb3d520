#include "services/kovacontentextractd/readers/encoding.h"

#include <uchardet.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <utility>

#include "services/kovacontentextractd/readers/converters.h"
#include "services/kovacontentextractd/readers/utf8.h"

namespace ferrox::extract {

namespace {

// What encoding a text is in is decided by certainty: what its bytes prove (marks, valid UTF-8, zeros of UTF-16,
// escapes), then what it says itself, then what statistics make of it (libuchardet), which needs some dozens of letters
// outside ASCII. The C library's converters (converters.h) do the rest.

/// How much statistics are shown.
constexpr size_t kDetectMaxBytes = 16 * 1024;
/// With fewer bytes outside ASCII than this, statistics is guessing.
constexpr size_t kSureFromBytes = 24;
/// What a text is read as when nothing tells more.
constexpr char kWestern[] = "WINDOWS-1252";

using namespace std::literals;

/// Bell to carriage return, the end mark of DOS, escape.
bool IsTextControl(unsigned char c) { return (c >= 0x07 && c <= 0x0d) || c == 0x1a || c == 0x1b; }

/// Whether there are more control characters than a text has (a few form feeds, escapes of a terminal's log).
bool LooksBinary(std::string_view bytes) {
  const std::string_view head = bytes.substr(0, 64 * 1024);
  size_t controls = 0;
  for (const char c : head) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte < 0x20 && !IsTextControl(byte)) ++controls;
  }
  return controls * 50 > head.size();
}

size_t CountHighBytes(std::string_view bytes) {
  return static_cast<size_t>(std::count_if(bytes.begin(), bytes.end(), [](char c) { return (c & 0x80) != 0; }));
}

// UTF-16 and UTF-32 need no tables; done here, a file of either costs no converter. Both functions are false when more
// than one unit in a hundred is none that a text has: an unpaired surrogate, a zero, U+FFFE.

bool FromUtf16(std::string_view bytes, bool big_endian, std::string& text) {
  text.clear();
  text.reserve(bytes.size());
  size_t bad = 0;
  const size_t units = bytes.size() / 2;
  const auto unit = [&](size_t i) -> uint32_t {
    const auto a = static_cast<unsigned char>(bytes[2 * i]), b = static_cast<unsigned char>(bytes[2 * i + 1]);
    return big_endian ? static_cast<uint32_t>(a << 8 | b) : static_cast<uint32_t>(b << 8 | a);
  };
  for (size_t i = 0; i < units; ++i) {
    uint32_t code = unit(i);
    const bool pair = code >= 0xD800 && code <= 0xDBFF && i + 1 < units && (unit(i + 1) & 0xFC00) == 0xDC00;
    if (pair) {
      code = 0x10000 + ((code & 0x3FF) << 10) + (unit(i + 1) & 0x3FF);
      ++i;
    } else if (code >= 0xD800 && code <= 0xDFFF && i + 1 < units) {
      ++bad;
    }
    if (code == 0 || code == 0xFFFE || code == 0xFFFF) ++bad;
    AppendUtf8(text, code == 0 ? 0xFFFD : code);
  }
  return bad * 100 <= units;
}

bool FromUtf32(std::string_view bytes, bool big_endian, std::string& text) {
  text.clear();
  text.reserve(bytes.size() / 2);
  size_t bad = 0;
  for (size_t i = 0; i + 4 <= bytes.size(); i += 4) {
    uint32_t code = 0;
    for (size_t k = 0; k < 4; ++k) code = code << 8 | static_cast<unsigned char>(bytes[i + (big_endian ? k : 3 - k)]);
    if (code == 0 || code > 0x10FFFF) ++bad;
    AppendUtf8(text, code == 0 ? 0xFFFD : code);
  }
  return bad * 100 <= bytes.size() / 4;
}

bool StartsWith(std::string_view text, std::string_view prefix) { return text.substr(0, prefix.size()) == prefix; }

/// A byte order mark; 1 when decoded, 0 when there is none, -1 when what follows is not what it announces.
int ByMark(std::string_view bytes, bool cut, DecodedText& decoded) {
  const auto found = [&](const char* name, bool good) {
    decoded.encoding = name;
    return good && !LooksBinary(decoded.text) ? 1 : -1;
  };
  if (StartsWith(bytes, "\xEF\xBB\xBF"sv)) {
    const std::string_view rest = bytes.substr(3);
    if (!IsUtf8(rest, cut)) return 0;
    decoded.text = rest.substr(0, ValidUtf8Prefix(rest));
    return found("UTF-8", true);
  }
  if (StartsWith(bytes, "\xFF\xFE\0\0"sv)) return found("UTF-32LE", FromUtf32(bytes.substr(4), false, decoded.text));
  if (StartsWith(bytes, "\0\0\xFE\xFF"sv)) return found("UTF-32BE", FromUtf32(bytes.substr(4), true, decoded.text));
  if (StartsWith(bytes, "\xFF\xFE"sv)) return found("UTF-16LE", FromUtf16(bytes.substr(2), false, decoded.text));
  if (StartsWith(bytes, "\xFE\xFF"sv)) return found("UTF-16BE", FromUtf16(bytes.substr(2), true, decoded.text));
  return 0;
}

/// UTF-16 without a mark shows by its blanks and line ends: zero bytes beside them, all on the same side.
bool BareUtf16(std::string_view bytes, DecodedText& decoded) {
  if (bytes.size() < 4) return false;
  const std::string_view head = bytes.substr(0, 8 * 1024);
  size_t little = 0, big = 0, zeros = 0;
  for (size_t i = 0; i + 1 < head.size(); i += 2) {
    const bool spacing_low = head[i] == ' ' || head[i] == '\n' || head[i] == '\r' || head[i] == '\t';
    const bool spacing_high = head[i + 1] == ' ' || head[i + 1] == '\n' || head[i + 1] == '\r' || head[i + 1] == '\t';
    if (head[i + 1] == 0 && (spacing_low || (head[i] > 0x20 && head[i] < 0x7f))) ++little;
    if (head[i] == 0 && (spacing_high || (head[i + 1] > 0x20 && head[i + 1] < 0x7f))) ++big;
    if (head[i] == 0 && head[i + 1] == 0) ++zeros;
  }
  const size_t units = head.size() / 2;
  const size_t best = std::max(little, big);
  // East Asian text has few such characters, but no zeros that are none of them.
  if (zeros > 0 || best * 50 < units || std::min(little, big) * 10 > best) return false;
  decoded.encoding = big > little ? "UTF-16BE" : "UTF-16LE";
  return FromUtf16(bytes, big > little, decoded.text) && !LooksBinary(decoded.text);
}

/// Text in UTF-8 with a few bytes of something else in it: at least ten good characters outside ASCII for each bad
/// byte.
bool DamagedUtf8(std::string_view bytes, DecodedText& decoded) {
  std::string text;
  text.reserve(bytes.size() + 16);
  size_t bad = 0;
  for (std::string_view rest = bytes; !rest.empty();) {
    const size_t valid = ValidUtf8Prefix(rest);
    text.append(rest.substr(0, valid));
    rest.remove_prefix(valid);
    if (rest.empty()) break;
    AppendUtf8(text, 0xFFFD);
    rest.remove_prefix(1);
    ++bad;
  }
  const auto characters = std::count_if(text.begin(), text.end(), [](char c) { return (c & 0xC0) == 0xC0; });
  if (static_cast<size_t>(characters) < 11 * bad) return false;
  decoded = {std::move(text), "UTF-8"};
  return true;
}

/// "ESC $ B" or "ESC $ @", which switch ISO-2022-JP to two bytes a character; the rest of it looks like ASCII.
bool HasJapaneseEscapes(std::string_view bytes) {
  const size_t escape = bytes.find("\x1b$"sv);
  return escape != std::string_view::npos && escape + 2 < bytes.size() &&
         (bytes[escape + 2] == 'B' || bytes[escape + 2] == '@');
}

/// The part of the text that tells most: from a little before the first byte outside ASCII.
std::string_view TellingPart(std::string_view bytes) {
  const auto first = std::find_if(bytes.begin(), bytes.end(), [](char c) { return (c & 0x80) != 0; });
  const auto at = static_cast<size_t>(first - bytes.begin());
  return bytes.substr(at > 256 ? at - 256 : 0, kDetectMaxBytes);
}

/// What statistics say of the bytes; empty when nothing.
std::string Detect(std::string_view bytes) {
  const std::unique_ptr<uchardet, decltype(&uchardet_delete)> detector(uchardet_new(), &uchardet_delete);
  if (detector == nullptr || uchardet_handle_data(detector.get(), bytes.data(), bytes.size()) != 0) return {};
  uchardet_data_end(detector.get());
  return uchardet_get_charset(detector.get());
}

/// Names that mean less than is in use under them.
std::string Usual(const std::string& encoding) {
  static constexpr std::pair<const char*, const char*> kWider[] = {
      {"ISO-8859-1", kWestern},
      {"US-ASCII", kWestern},
      {"ASCII", kWestern},
      {"LATIN1", kWestern},
      {"GB2312", "GB18030"},
      {"GBK", "GB18030"},
      {"SHIFT_JIS", "CP932"},
      {"SJIS", "CP932"},
      {"EUC-KR", "UHC"},
      {"KS_C_5601-1987", "UHC"},
      {"ISO-8859-9", "WINDOWS-1254"},
      {"X-SJIS", "CP932"},
      {"TIS-620", "WINDOWS-874"},
      {"ISO-8859-11", "WINDOWS-874"},
      {"BIG5", "BIG5-HKSCS"},
      {"KOI8-R", "KOI8-U"},
  };
  std::string name = encoding;
  for (char& c : name) {
    if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 'a' + 'A');
  }
  for (const auto& [narrow, wide] : kWider) {
    if (name == narrow) return wide;
  }
  return name;
}

/// The Windows encoding in whose place an ISO one was detected: text has no use for the ISO's 32 control characters,
/// where the Windows one has letters and quotation marks.
std::string WithWindowsLetters(const std::string& detected, std::string_view bytes) {
  static constexpr std::pair<const char*, const char*> kWindows[] = {
      {"ISO-8859-2", "WINDOWS-1250"},  {"ISO-8859-7", "WINDOWS-1253"}, {"ISO-8859-8", "WINDOWS-1255"},
      {"ISO-8859-13", "WINDOWS-1257"}, {"ISO-8859-15", kWestern},      {"ISO-8859-6", "WINDOWS-1256"},
  };
  const bool has_letters = std::any_of(bytes.begin(), bytes.end(), [](char c) { return (c & 0xE0) == 0x80; });
  for (const auto& [iso, windows] : kWindows) {
    if (has_letters && detected == iso) return windows;
  }
  return detected;
}

/// Whether few bytes are enough to believe in this encoding rather than in Western: those that are in wide use.
bool IsCommon(const std::string& encoding) {
  static constexpr const char* kRare[] = {"ISO-8859-3",  "ISO-8859-4",  "ISO-8859-10",  "ISO-8859-13",
                                          "ISO-8859-14", "ISO-8859-16", "WINDOWS-1258", "VISCII"};
  const bool rare = std::find(std::begin(kRare), std::end(kRare), encoding) != std::end(kRare);
  return !rare && encoding.find("MAC-") != 0 && encoding.find("IBM") != 0;
}

/// Detects the encoding by statistics. What nothing identifies is read as Western, the commonest.
bool Guess(std::string_view bytes, bool cut, DecodedText& decoded) {
  const std::string_view telling = TellingPart(bytes);
  const std::string detected = WithWindowsLetters(Usual(Detect(telling)), telling);
  const bool sure = CountHighBytes(telling) >= kSureFromBytes;
  const bool usable = !detected.empty() && detected.find("UTF-") != 0 && (sure || IsCommon(detected));
  if (usable && ConvertToUtf8(bytes, detected, cut, decoded.text)) {
    decoded.encoding = detected + (sure ? "" : " (guess)");
    return true;
  }
  // Western leaves five bytes open, so real text passes and scattered bytes mostly do not.
  decoded.encoding = std::string(kWestern) + " (guess)";
  return ConvertToUtf8(bytes, kWestern, cut, decoded.text);
}

}  // namespace

/// In the order of certainty that the header gives. Zeros in what is not UTF-16 are no text.
bool Decode(std::string_view bytes, bool cut, const std::string& declared, DecodedText& decoded) {
  decoded = {};
  const int by_mark = ByMark(bytes, cut, decoded);
  if (by_mark != 0) return by_mark > 0;
  if (memchr(bytes.data(), 0, bytes.size()) != nullptr) return BareUtf16(bytes, decoded);
  if (LooksBinary(bytes)) return false;
  if (HasJapaneseEscapes(bytes)) {
    decoded.encoding = "ISO-2022-JP";
    if (ConvertToUtf8(bytes, decoded.encoding, cut, decoded.text)) return true;
  }
  if (IsUtf8(bytes, cut)) {
    decoded.encoding = "UTF-8";
    decoded.text = cut ? bytes.substr(0, ValidUtf8Prefix(bytes)) : bytes;
    return true;
  }
  if (DamagedUtf8(bytes, decoded)) return true;
  if (!declared.empty()) {
    decoded.encoding = Usual(declared);
    const bool eight_bit = decoded.encoding.find("UTF-") != 0 && decoded.encoding.find("UCS") != 0;
    if (eight_bit && ConvertToUtf8(bytes, decoded.encoding, cut, decoded.text)) return true;
  }
  return Guess(bytes, cut, decoded);
}

}  // namespace ferrox::extract
