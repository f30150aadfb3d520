#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace ferrox::engine {

constexpr size_t kTitleMaxBytes = 200;

/// What a text calls itself: the NAME line of a manual page, the first heading, the subject of a mail, or a first line
/// that looks like a title. One line of at most kTitleMaxBytes; "" when there is none. `ext` is the file's extension in
/// small letters, without its dot; of a packed file, the one before ("md" of "a.md.gz") tells more. Reads 16 KiB.
std::string TitleOf(std::string_view text, std::string_view ext);

}  // namespace ferrox::engine
