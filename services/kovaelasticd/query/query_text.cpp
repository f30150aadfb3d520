#include "services/kovaelasticd/query/query_text.h"

#include <algorithm>
#include <cstdint>

#include "base/text.h"
#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/query/query_lexer.h"
#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

constexpr char kBlanks[] = " \t\n\v\f\r";

/// What a character is read as; 0: as it is.
char PlainForm(uint32_t c, bool begins_word) {
  switch (c) {
    case 0xAB:
    case 0xBB:
    case 0x201C:
    case 0x201D:
    case 0x201E:
    case 0x201F:
      return '"';
    case 0xA0:
    case 0x202F:
    case 0x3000:
      return ' ';
    case 0x2013:
    case 0x2212:
      return begins_word ? '-' : '\0';
    default:
      return c >= 0xFF01 && c <= 0xFF5E ? static_cast<char>(c - 0xFF01 + '!') : '\0';
  }
}

std::string_view Trimmed(std::string_view text) {
  const size_t begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return {};
  return text.substr(begin, text.find_last_not_of(kBlanks) + 1 - begin);
}

int HexDigit(char c) {
  const char lower = base::LowerAscii(c);
  return c >= '0' && c <= '9' ? c - '0' : lower >= 'a' && lower <= 'f' ? lower - 'a' + 10 : -1;
}

/// With "%20" and the like as what they stand for.
std::string Unescaped(std::string_view address) {
  std::string plain;
  for (size_t at = 0; at < address.size(); ++at) {
    const int high = address[at] == '%' && at + 2 < address.size() ? HexDigit(address[at + 1]) : -1;
    const int low = high < 0 ? -1 : HexDigit(address[at + 2]);
    const int byte = low < 0 ? 0 : high * 16 + low;
    plain += byte == 0 ? address[at] : static_cast<char>(byte);
    if (byte != 0) at += 2;
  }
  return plain;
}

}  // namespace

QueryText ReadQueryText(std::string_view typed) {
  QueryText read;
  if (typed.size() > kQueryMaxBytes) {
    size_t end = typed.find_last_of(kBlanks, kQueryMaxBytes);
    if (end == std::string_view::npos) end = kQueryMaxBytes;
    typed = typed.substr(0, end);
    read.is_cut = true;
  }
  bool small = false, capital = false;
  for (size_t at = 0; at < typed.size();) {
    const CodePoint c = DecodeAt(typed, at);
    const bool begins_word = read.text.empty() || IsQueryBlank(read.text.back());
    const char plain = c.value < 0x80 ? '\0' : PlainForm(c.value, begins_word);
    if (plain != '\0') {
      read.text += plain;
    } else {
      read.text += typed.substr(at, c.length_bytes);
    }
    const char last = read.text.back();
    small = small || (last >= 'a' && last <= 'z');
    capital = capital || (last >= 'A' && last <= 'Z');
    at += c.length_bytes;
  }
  read.all_capitals = capital && !small;
  read.is_pasted = Trimmed(read.text).find('\n') != std::string_view::npos;
  return read;
}

std::string PlaceOfAddress(std::string_view query) {
  std::string address(Trimmed(query));
  const std::string lower = base::LowerAscii(address.substr(0, 8));
  bool has_server = true;
  if (address.starts_with("\\\\")) {
    std::replace(address.begin(), address.end(), '\\', '/');
    address.erase(0, 2);
  } else if (lower.starts_with("smb://") || lower.starts_with("afp://") || lower.starts_with("nfs://")) {
    address = Unescaped(address.substr(6));
  } else if (lower.starts_with("file:///")) {
    address = Unescaped(address.substr(7));
    has_server = false;
  } else {
    return {};
  }
  if (has_server) address.erase(0, std::min(address.find('/'), address.size()));
  while (address.ends_with('/')) address.pop_back();
  const bool is_place = address.size() > 1 && address.find_first_of(std::string("\n\0", 2)) == std::string::npos;
  return is_place ? address : std::string();
}

}  // namespace ferrox::engine
