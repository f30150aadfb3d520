#pragma once

#include <string>
#include <string_view>

namespace ferrox::engine {

/// The first section of a manual page in roff source, of man's macros or mdoc's: "lsof - list open files". "" when
/// `text` has no section or does not begin as such a page. To be cleaned and cut by the caller.
std::string ManualTitle(std::string_view text);

}  // namespace ferrox::engine
