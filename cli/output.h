#pragma once

#include <string>

#include <json/value.h>

/// Where the commands write: results on standard output, everything else on standard error, so that a script can take
/// the one without the other.
namespace ferrox::cli {

/// One line on standard error, "fileindexctl: <text>", made safe for a terminal.
void Warn(const std::string& text);

/// One line of JSON on standard output (ToScriptJson).
void PrintJson(const Json::Value& value);

/// Hands what was printed to the system: until then a full disk or a closed pipe goes unnoticed.
/// @throws Failure when standard output does not take it.
void FlushOutput();

/// Writes bytes as they are. @throws Failure likewise.
void PrintBytes(const std::string& bytes);

}  // namespace ferrox::cli
