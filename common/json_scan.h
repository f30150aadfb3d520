#pragma once

#include <cstddef>
#include <optional>
#include <string_view>
#include <vector>

#include "common/export.h"

/// JSON texts from outside before they are parsed: as a tree, a text of "[0,0,..." takes fifty times its own size.
/// Nothing here builds any value, or says that a text is valid.
namespace ferrox {

/// How many values a text has at most, members' names not counted.
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
