#define FERROX_SOURCE "optree"

#include "fileindex/queue/event.h"

#include "common/error.h"
#include "common/json_util.h"
#include "common/log.h"
#include "fileindex/queue/event_scan.h"

namespace ferrox::fileindex {

namespace {

bool HasNul(const std::string& text) { return text.find('\0') != std::string::npos; }

/// The limit and the NUL are asked first: the JSON library would read both, the NUL as the end of a text.
bool ParseLine(Json::Value& data, const std::string& event_raw) {
  return event_raw.size() <= kQueueLineMaxBytes && !HasNul(event_raw) && fromString(data, event_raw);
}

}  // namespace

Event::Event(const std::string& event_raw) {
  // The plain form first. Where it reads a line, the JSON library would read the same.
  EventFields plain;
  if (event_raw.size() <= kQueueLineMaxBytes && ScanPlainEvent(event_raw, plain)) {
    event = plain.event;
    is_dir = plain.is_dir;
    path = plain.path;
    path_old = plain.path_old;
    return;
  }
  Json::Value line;
  FERROX_FAIL_IF_AS(!ParseLine(line, event_raw), "!data.fromString(event_raw)", Error::kMalformedEvent,
                    "Malformed event_raw: " + event_raw);
  GetJsonValue(event, line, "event", true);
  GetJsonValue(is_dir, line, "is_dir", false);
  GetJsonValue(path, line, "path", true);
  GetJsonValue(path_old, line, "path_old", false);
  GetJsonValue(data, line, "data", false);
  // No file has such a path; as text for the system it would name another one.
  FERROX_FAIL_IF(HasNul(path) || HasNul(path_old), Error::kMalformedEvent, "Malformed event_raw: " + event_raw);
}

}  // namespace ferrox::fileindex
