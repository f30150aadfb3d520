#include "services/kovacontentextractd/readers/entities.h"

#include <algorithm>
#include <iterator>

namespace ferrox::extract {

namespace {

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

}  // namespace ferrox::extract
