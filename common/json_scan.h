#pragma once

#include <cstddef>
#include <optional>
#include <string_view>
#include <vector>

#include "common/export.h"

/// JSON texts from outside before they are parsed: as a tree, a text of "[0,0,..." takes fifty times its own size.
/// So a request is counted, and cut into its members, before any of it is built. Nothing here says that a text is
/// valid: of an invalid one the answers are some, but nothing outside of the text is read and no memory is taken for
/// values. Views point into the text and live as long as that.
namespace ferrox {

/// How many values a text has at most, members' names not counted. Linear in the text, without memory of its own.
FERROX_EXPORT size_t CountJsonValues(std::string_view text);

struct JsonMember {
  std::string_view name;  ///< as it is written, in its quotes
  std::string_view value;
};

/// The members of the object that makes up the whole text, or the elements of such an array, each as it is written;
/// nothing when it is none, or has more than `most`.
FERROX_EXPORT std::optional<std::vector<JsonMember>> JsonMembers(std::string_view object, size_t most);
FERROX_EXPORT std::optional<std::vector<std::string_view>> JsonElements(std::string_view array, size_t most);

}  // namespace ferrox
