#include <algorithm>
#include <iterator>

#include <kova/content_type.h>

namespace kova::content {

namespace {

struct ExtensionRow {
  std::string_view extension;
  const char* type;
};

constexpr ExtensionRow kExtensions[] = {
#include "platform/shared/content_extensions.inc"
};
// What the binary search below relies on.
static_assert(std::is_sorted(std::begin(kExtensions), std::end(kExtensions),
                             [](const ExtensionRow& a, const ExtensionRow& b) { return a.extension < b.extension; }));

}  // namespace

const char* TypeByExtension(std::string_view extension) {
  const ExtensionRow* found =
      std::lower_bound(std::begin(kExtensions), std::end(kExtensions), extension,
                       [](const ExtensionRow& row, std::string_view wanted) { return row.extension < wanted; });
  return found != std::end(kExtensions) && found->extension == extension ? found->type : nullptr;
}

const char* TypeAtBeginning(std::string_view text) {
  for (const ExtensionRow& row : kExtensions) {
    const std::string_view type = row.type;
    if (text.substr(0, type.size()) == type) return row.type;
  }
  return nullptr;
}

}  // namespace kova::content
