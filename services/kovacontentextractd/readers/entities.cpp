#include "services/kovacontentextractd/readers/entities.h"

#include <algorithm>
#include <iterator>

namespace ferrox::extract {

namespace {

using namespace std::literals;

struct Row {
  std::string_view name;
  uint32_t code_point;
};

constexpr Row kRows[] = {
#include "services/kovacontentextractd/readers/html_entities.inc"
};
// What the binary search below relies on.
static_assert(std::is_sorted(std::begin(kRows), std::end(kRows),
                             [](const Row& a, const Row& b) { return a.name < b.name; }));

}  // namespace

uint32_t HtmlEntity(std::string_view name) {
  const Row* found = std::lower_bound(std::begin(kRows), std::end(kRows), name,
                                      [](const Row& row, std::string_view wanted) { return row.name < wanted; });
  return found != std::end(kRows) && found->name == name ? found->code_point : 0;
}

uint32_t XmlEntity(std::string_view name) {
  if (name == "amp"sv) return '&';
  if (name == "lt"sv) return '<';
  if (name == "gt"sv) return '>';
  if (name == "quot"sv) return '"';
  return name == "apos"sv ? '\'' : 0;
}

std::optional<uint32_t> ReferenceNumber(std::string_view name) {
  constexpr uint32_t kBeyond = 0x110000;
  const bool hex = name.size() > 1 && (name[1] == 'x' || name[1] == 'X');
  uint32_t code = 0;
  for (const char c : name.substr(hex ? 2 : 1)) {
    const char lower = static_cast<char>(c | 0x20);
    const bool digit = c >= '0' && c <= '9';
    if (!digit && !(hex && lower >= 'a' && lower <= 'f')) return std::nullopt;
    const auto value = static_cast<uint32_t>(digit ? c - '0' : lower - 'a' + 10);
    code = std::min<uint32_t>(code * (hex ? 16 : 10) + value, kBeyond);
  }
  return code;
}

}  // namespace ferrox::extract
