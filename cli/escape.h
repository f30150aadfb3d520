#pragma once

#include <string>
#include <string_view>

#include <json/value.h>

/// File names are bytes. This is the one place that makes them safe to show: on a terminal, and in JSON for scripts.
namespace ferrox::cli {

/// For people: valid UTF-8 stays, every control character and every byte that is not part of valid UTF-8 becomes \xXX.
std::string EscapeForTerminal(std::string_view text);
/// The same for a text with line breaks of its own: each run of blanks and line breaks becomes one blank first.
std::string EscapeOneLine(std::string_view text);

/// One line of valid UTF-8: each byte that is not part of valid UTF-8 is written as the lone surrogate escape \udcXX,
/// which Python's "surrogateescape" turns back into the byte.
std::string ToScriptJson(const Json::Value& value);

/// The number of bytes of the UTF-8 character that `text` begins with, 0 when it begins with none.
size_t Utf8Length(std::string_view text);

}  // namespace ferrox::cli
