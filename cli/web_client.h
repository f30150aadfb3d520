#pragma once

#include <chrono>
#include <string>

#include <json/value.h>

namespace ferrox::cli {

/// What the web daemon answered to one request on its Unix socket.
struct WebReply {
  enum class Outcome { kAnswered, kNotRunning, kNotPermitted, kNoAnswer };

  Outcome outcome = Outcome::kNoAnswer;
  int status = 0;    ///< of HTTP
  Json::Value body;  ///< an object; of a failure with "detail"
};

/// Asks the web daemon of this instance, as the calling user (docs/http.md). Blocks at most `longest` for each piece of
/// the answer. @param body null: none
WebReply AskWebDaemon(const std::string& method, const std::string& target, const Json::Value& body,
                      std::chrono::seconds longest);

}  // namespace ferrox::cli
