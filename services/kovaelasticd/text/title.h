#pragma once

#include <string>
#include <string_view>

namespace ferrox::engine {

/// What a text calls itself: the NAME line of a manual page, the first heading, the subject of a mail, or a first line
/// that looks like a title. One line of at most 200 bytes; "" when there is none. `ext` is the file's extension in
/// small letters, without its dot.
std::string TitleOf(std::string_view text, std::string_view ext);

}  // namespace ferrox::engine
