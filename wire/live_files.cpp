#include "wire/live_files.h"

#include <json/value.h>

#include "common/error.h"
#include "common/json_util.h"
#include "common/paths.h"
#include "wire/frame_client.h"

namespace ferrox::wire {

namespace {

using Milliseconds = std::chrono::milliseconds;

[[noreturn]] void ThrowRightsUnknown(const std::string& reason) {
  throw Error(Error::kEngineRightsUnknown, "what you may read cannot be checked now: " + reason);
}

/// Users are told it: of another failure than one that is meant for them, nothing.
std::string ReasonOf(const Reply& reply) {
  switch (reply.outcome) {
    case Outcome::kRefused:
      return reply.code == Error::kEngineRightsUnknown ? reply.message : "kova-access cannot tell; its log says why";
    case Outcome::kNotRunning:
      return "kova-access does not run";
    case Outcome::kNotPermitted:
      return "kova-access may not be asked";
    case Outcome::kNoAnswer:
      return "kova-access does not answer in time";
    default:
      return "kova-access gives no usable answer";
  }
}

Json::Value RequestFor(uint32_t uid, const std::vector<uint32_t>& groups, const std::string& share_root) {
  Json::Value request;
  request["uid"] = uid;
  request["root"] = share_root;
  Json::Value& list = request["groups"] = Json::Value(Json::arrayValue);
  for (const uint32_t gid : groups) list.append(gid);
  return request;
}

/// @return the reply's data
Json::Value AskAccess(const char* type, const Json::Value& request, Milliseconds longest,
                      base::UniqueFd* descriptor = nullptr) {
  Reply reply = AskDaemon(kAccessSocket, type, request, longest, descriptor);
  if (reply.outcome != Outcome::kAnswered) ThrowRightsUnknown(ReasonOf(reply));
  if (!reply.data.isObject()) ThrowRightsUnknown("kova-access gives no usable answer");
  return std::move(reply.data);
}

/// Members that are missing say no.
LiveFile ReadFile(const Json::Value& json) {
  LiveFile file;
  GetJsonValue(file.readable, json, "readable", false);
  GetJsonValue(file.folder, json, "folder", false);
  GetJsonValue(file.entered, json, "entered", false);
  GetJsonValue(file.stamp, json, "stamp", false);
  return file;
}

}  // namespace

std::vector<LiveFile> LookAs(uint32_t uid, const std::vector<uint32_t>& groups, const std::string& share_root,
                             const std::vector<std::string>& paths, Milliseconds longest) {
  std::vector<LiveFile> files;
  files.reserve(paths.size());
  Json::Value request = RequestFor(uid, groups, share_root);
  while (files.size() < paths.size()) {
    Json::Value& asked = request["paths"] = Json::Value(Json::arrayValue);
    size_t bytes = 0;
    for (size_t i = files.size(); i < paths.size() && asked.size() < kLookMaxPaths && bytes < kLookMaxBytes; ++i) {
      asked.append(paths[i]);
      bytes += paths[i].size();
    }
    const Json::Value found = AskAccess("look", request, longest)["files"];
    if (!found.isArray() || found.size() != asked.size()) ThrowRightsUnknown("kova-access gives no usable answer");
    for (const Json::Value& file : found) {
      if (!file.isObject()) ThrowRightsUnknown("kova-access gives no usable answer");
      files.push_back(ReadFile(file));
    }
  }
  return files;
}

base::UniqueFd OpenAs(uint32_t uid, const std::vector<uint32_t>& groups, const std::string& share_root,
                      const std::string& path, Milliseconds longest) {
  Json::Value request = RequestFor(uid, groups, share_root);
  request["path"] = path;
  base::UniqueFd file;
  (void)AskAccess("open", request, longest, &file);
  return file;
}

}  // namespace ferrox::wire
