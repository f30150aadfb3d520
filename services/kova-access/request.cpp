#include "services/kova-access/request.h"

#include "common/error.h"
#include "common/log.h"

namespace ferrox::access {

namespace {

constexpr size_t kPathsMax = 2000;
constexpr uint32_t kNoId = UINT32_MAX;

uint32_t ReadId(const Json::Value& json) {
  const bool is_id = json.isUInt() && json.asUInt() != kNoId;
  FERROX_FAIL_IF(!is_id, Error::kBadArgument, "a uid or a gid is missing or unusable");
  return json.asUInt();
}

std::string ReadPath(const Json::Value& json) {
  std::string path = json.isString() ? json.asString() : "";
  FERROX_FAIL_IF(!path.starts_with('/') || path.find('\0') != std::string::npos, Error::kBadArgument,
                 "a path is missing or not absolute");
  return path;
}

/// A user that has root's uid is not one whose rights are asked for, and would be given less than it has.
User ReadUser(const Json::Value& data) {
  User user;
  user.uid = ReadId(data["uid"]);
  FERROX_FAIL_IF(user.uid == 0, Error::kEngineNotPermitted, "root may open everything; it is not asked for");
  const Json::Value& groups = data["groups"];
  FERROX_FAIL_IF(!groups.isArray() || groups.empty(), Error::kBadArgument, "\"groups\" is no list, or empty");
  user.groups.reserve(groups.size());
  for (const Json::Value& gid : groups) user.groups.push_back(ReadId(gid));
  return user;
}

Request::Kind ReadKind(const std::string& type) {
  if (type == "status") return Request::Kind::kStatus;
  if (type == "trust") return Request::Kind::kTrust;
  if (type == "synonyms") return Request::Kind::kSynonyms;
  FERROX_FAIL_IF(type != "look" && type != "open", Error::kBadArgument, "unknown command " + type);
  return type == "look" ? Request::Kind::kLook : Request::Kind::kOpen;
}

}  // namespace

Request ReadRequest(const std::string& type, const Json::Value& data) {
  Request request{ReadKind(type), {}, {}, {}, {}};
  if (request.kind == Request::Kind::kStatus || request.kind == Request::Kind::kTrust) return request;
  FERROX_FAIL_IF(!data.isObject(), Error::kBadArgument, "\"data\" is no object");
  if (request.kind == Request::Kind::kSynonyms) {
    FERROX_FAIL_IF(!data["known"].isString(), Error::kBadArgument, "\"known\" is no text");
    request.known = data["known"].asString();
    return request;
  }
  request.user = ReadUser(data);
  request.root = ReadPath(data["root"]);
  if (request.kind == Request::Kind::kOpen) {
    request.paths.push_back(ReadPath(data["path"]));
    return request;
  }
  const Json::Value& paths = data["paths"];
  FERROX_FAIL_IF(!paths.isArray() || paths.size() > kPathsMax, Error::kBadArgument,
                 "\"paths\" is no list, or has more than " + std::to_string(kPathsMax) + " elements");
  request.paths.reserve(paths.size());
  for (const Json::Value& path : paths) request.paths.push_back(ReadPath(path));
  return request;
}

}  // namespace ferrox::access
