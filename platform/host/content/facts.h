#pragma once

#include <sys/stat.h>

#include <string>

#include <json/value.h>

namespace kova::content {

/// What is known of a file without opening it.
struct Facts {
  std::string extension;  ///< in lower case
  std::string access;     ///< as KOVA::CONTENT_EXTRACT::Access gives it
  struct statx info = {};
};

/// Examines the file at `path` and puts what is known of it into `document`.
/// @throws std::runtime_error when it cannot be examined.
Facts AddFacts(const std::string& path, Json::Value& document);

/// The content type of what is no regular file, by its mode.
const char* TypeByMode(unsigned mode);

}  // namespace kova::content
