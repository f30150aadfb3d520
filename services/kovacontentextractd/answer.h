#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include <json/value.h>

#include "base/unique_fd.h"

namespace ferrox::extract {

/// A file within the file that was read.
struct AttachedFile {
  std::string name;     ///< for hints
  base::UniqueFd file;  ///< in memory; nobody can change it
};

/// What a worker found, as far as it can be believed.
struct Answer {
  Json::Value fields = Json::Value(Json::objectValue);  ///< metadata, and "_KOVATextCut" and the like
  size_t text_bytes = 0;                                ///< of the file's text, which has been handed on
  std::vector<AttachedFile> attachments;
};

/// Where in a worker's region an attachment lies.
struct AttachedBytes {
  std::string name;
  uint32_t offset;
  uint32_t bytes;
};

/// Reads the JSON text of a worker's answer. The worker may have been taken over by what it read, so nothing of it is
/// trusted: only fields that come from a file's content are taken, each of the type that the index expects (a number
/// for a text field becomes a text), and none beyond its limit; only attachments that lie where they may.
/// @return false when the text is no answer at all.
bool ParseAnswer(const std::string& json, Json::Value& fields, std::vector<AttachedBytes>& attachments);

}  // namespace ferrox::extract
