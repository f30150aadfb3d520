#pragma once

#include <string>
#include <string_view>

#include <json/forwards.h>

/// The one way in which JSON is parsed in this system, for files and messages alike.
namespace base {

/// What is read besides the JSON that all accept. None takes comments (but for the few places where the JSON library
/// passes over them), commas too many, single quotes, text behind the value or nesting deeper than 1000.
enum class JsonRules {
  kAnyValue,  ///< any value makes up a text; of members with one name, the last counts
  kDocument,  ///< an object or an array alone, and no member twice: for files that people write
};

/// Parses a whole text. False, with `value` null and, unless it is null, `problem` with the parser's words, for
/// anything else. Throws std::bad_alloc alone: a file for which memory is short must not look damaged. Each thread
/// keeps its parsers, so that small texts cost little.
bool ParseJson(std::string_view text, JsonRules rules, Json::Value& value, std::string* problem = nullptr);

/// Reads and parses a regular file; false, with `value` null, when it cannot be read or parsed. Throws as
/// ParseJson does.
bool ReadJsonFile(const std::string& path, JsonRules rules, Json::Value& value);

}  // namespace base
