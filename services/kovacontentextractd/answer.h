#pragma once

#include <cstddef>
#include <string>

#include <json/value.h>

namespace ferrox::extract {

/// What a worker found, as far as it can be believed.
struct Answer {
  Json::Value fields = Json::Value(Json::objectValue);  ///< metadata, and "_KOVATextCut" and the like
  size_t text_bytes = 0;                                ///< of the file's text, which has been handed on
};

/// Reads the JSON text of a worker's answer. The worker may have been taken over by what it read, so nothing of it is
/// trusted: only fields that come from a file's content are taken, each of the type that the index expects (a number
/// for a text field becomes a text), and none beyond its limit.
/// @return false when the text is no answer at all.
bool ParseAnswer(const std::string& json, Json::Value& fields);

}  // namespace ferrox::extract
