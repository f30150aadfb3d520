#include "services/kovacontentextractd/readers/declared_encoding.h"

#include <algorithm>

#include "services/kovacontentextractd/readers/markup_bytes.h"

namespace ferrox::extract {

namespace {

using namespace std::literals;

/// The value that follows `key` and "=" at the beginning of `text`, quoted or not.
std::string ValueAfter(std::string_view text, std::string_view key) {
  if (!StartsWithNoCase(text, key)) return {};
  text.remove_prefix(key.size());
  const auto skip_blanks = [&text] { text.remove_prefix(std::min(text.find_first_not_of(" \t\r\n"sv), text.size())); };
  skip_blanks();
  if (text.empty() || text.front() != '=') return {};
  text.remove_prefix(1);
  skip_blanks();
  if (!text.empty() && (text.front() == '"' || text.front() == '\'')) text.remove_prefix(1);
  size_t length = 0;
  while (length < text.size() && length < 40 && IsMarkupNameByte(text[length])) ++length;
  return std::string(text.substr(0, length));
}

}  // namespace

std::string DeclaredHtmlEncoding(std::string_view head) {
  head = head.substr(0, 4096);
  for (size_t tag = head.find('<'); tag != std::string_view::npos; tag = head.find('<', tag + 1)) {
    if (!StartsWithNoCase(head.substr(tag), "<meta"sv)) continue;
    const std::string_view inside = head.substr(tag, head.find('>', tag) - tag);
    for (size_t at = 5; at < inside.size(); ++at) {
      std::string value = ValueAfter(inside.substr(at), "charset"sv);
      if (!value.empty()) return value;
    }
  }
  return DeclaredXmlEncoding(head);
}

std::string DeclaredXmlEncoding(std::string_view head) {
  constexpr std::string_view kBegin = "<?xml";
  if (!head.starts_with(kBegin)) return {};
  const std::string_view inside = head.substr(0, std::min<size_t>(head.find("?>"sv), 512));
  for (size_t at = kBegin.size(); at < inside.size(); ++at) {
    std::string value = ValueAfter(inside.substr(at), "encoding"sv);
    if (!value.empty()) return value;
  }
  return {};
}

}  // namespace ferrox::extract
