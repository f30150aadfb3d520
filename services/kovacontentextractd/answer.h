#pragma once

#include <string>

#include <json/value.h>

namespace ferrox::extract {

/// What a worker found, as far as it can be believed.
struct Answer {
  Json::Value fields = Json::Value(Json::objectValue);  ///< metadata, and "_KOVATextCut" and the like
  std::string text;                                     ///< of the file; UTF-8
};

/// Reads a worker's answer: a JSON object and, behind a zero byte, the file's text. The worker may have been taken over
/// by what it read, so nothing of it is trusted: only fields that come from a file's content are taken, each of the
/// type that the index expects (a number for a text field becomes a text), and neither fields nor text beyond their
/// limits.
/// @return false when the bytes are no answer at all.
bool ParseAnswer(std::string bytes, Answer& answer);

}  // namespace ferrox::extract
