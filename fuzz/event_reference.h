#pragma once

#include <string>

#include "common/error.h"
#include "common/json_util.h"
#include "fileindex/optree/optree.h"

/// Queue lines read by the JSON library alone, to hold the quick reading against.
namespace ferrox::test {

inline std::string EventText(uint32_t event, bool is_dir, const std::string& path, const std::string& path_old,
                             const Json::Value& data) {
  return std::to_string(event) + (is_dir ? " dir " : " ") + path + " < " + path_old + " " + toString(data);
}

inline std::string ErrorText(const Error& error) { return std::to_string(error.Code()) + " " + error.what(); }

/// What becomes of the line: the event's members or the error.
inline std::string Outcome(const std::string& line) {
  try {
    const fileindex::Event event(line);
    return EventText(event.event, event.is_dir, event.path, event.path_old, event.data);
  } catch (const Error& error) {
    return ErrorText(error);
  }
}

/// The same by the JSON library.
inline std::string ReferenceOutcome(const std::string& line) {
  uint32_t event = 0;
  bool is_dir = false;
  std::string path;
  std::string path_old;
  Json::Value data;
  Json::Value members;
  const bool has_nul = line.find('\0') != std::string::npos;
  if (line.size() > fileindex::kQueueLineMaxBytes || has_nul || !fromString(members, line))
    return ErrorText(Error(Error::kMalformedEvent, "Malformed event_raw: " + line));
  try {
    GetJsonValue(event, members, "event", true);
    GetJsonValue(is_dir, members, "is_dir", false);
    GetJsonValue(path, members, "path", true);
    GetJsonValue(path_old, members, "path_old", false);
    GetJsonValue(data, members, "data", false);
  } catch (const Error& error) {
    return ErrorText(error);
  }
  if ((path + path_old).find('\0') != std::string::npos) {
    return ErrorText(Error(Error::kMalformedEvent, "Malformed event_raw: " + line));
  }
  return EventText(event, is_dir, path, path_old, data);
}

}  // namespace ferrox::test
