#pragma once

#include <string>
#include <string_view>

#include <json/value.h>

/// File names are bytes. This is the one place that makes them safe to show: on a terminal, and in JSON for scripts.
namespace ferrox::cli {

/// For people, who may look at names that an attacker chose: valid UTF-8 stays; every control character, those that
/// turn the direction of the text among them, and every byte that is not part of valid UTF-8 becomes \xXX.
std::string EscapeForTerminal(std::string_view text);
/// The same for a text of several lines: its tabulators stay, and its line breaks, each as a newline.
std::string EscapeText(std::string_view text);
/// The same for a text with line breaks of its own: each run of blanks and line breaks becomes one blank first.
std::string EscapeOneLine(std::string_view text);

/// One line of valid UTF-8 without any control character: those are \uXXXX, which is the same value in JSON. Each byte
/// that is not part of valid UTF-8 is written as the lone surrogate escape \udcXX, which Python's "surrogateescape"
/// turns back into the byte.
std::string ToScriptJson(const Json::Value& value);

}  // namespace ferrox::cli
