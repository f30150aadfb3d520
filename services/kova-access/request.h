#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "services/kova-access/as_user.h"

namespace ferrox::access {

/// What is asked (docs/formats/access.md). Whoever asks may say anything; what is read here is within its bounds.
struct Request {
  enum class Kind { kStatus, kTrust, kSynonyms, kLook, kOpen };

  Kind kind;
  User user;                       ///< neither uid 0 nor an id that the kernel takes for "unchanged"
  std::string root;                ///< an absolute path
  std::vector<std::string> paths;  ///< one to open; to look at, at most 2,000. No text has a zero byte
  std::string known = {};          ///< of kSynonyms: the stamp of the list that the client has
};

/// @throws Error kBadArgument for what is no request, kEngineNotPermitted for uid 0.
Request ReadRequest(const std::string& type, const Json::Value& data);

}  // namespace ferrox::access
