#pragma once

#include <cstdint>
#include <string>

#include <json/value.h>

namespace ferrox::indexd {

/// Progress of the comparison of disk and index that is under way, or the figures of the last one. Times are of a clock
/// that does not jump, in milliseconds. Not locked: ShareStatus guards it.
struct ComparisonProgress {
  bool running = false;
  std::string path;
  int64_t began_ms = 0;
  int64_t ended_ms = 0;
  uint64_t examined = 0;  ///< files that are done
  uint64_t estimate = 0;  ///< files in all, as far as they have been counted
  bool estimate_complete = false;

  void End(int64_t now_ms) {
    if (running) ended_ms = now_ms;
    running = false;
  }
  Json::Value ToJson(int64_t now_ms) const {
    Json::Value json;
    json["running"] = running;
    json["path"] = path;
    json["examined"] = Json::UInt64(examined);
    json["estimate"] = Json::UInt64(estimate);
    json["estimate_complete"] = estimate_complete;
    json["elapsed_ms"] = Json::Int64((running ? now_ms : ended_ms) - began_ms);
    return json;
  }
};

}  // namespace ferrox::indexd
