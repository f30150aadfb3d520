#include "services/support/json_command.h"

#include <unistd.h>

#include <algorithm>

#include "common/error.h"
#include "common/json_scan.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/support/engine_user.h"

namespace ferrox::services {

namespace {

/// As a tree, a request may be fifty times as large.
constexpr size_t kValuesMax = 50000;

Json::Value ErrorReply(int code, const std::string& message) {
  Json::Value reply;
  reply["success"] = false;
  reply["error"]["code"] = code;
  reply["error"]["msg"] = message;
  return reply;
}

constexpr char kNotObeyed[] = "only root and the owner of this instance may steer it";

/// A request is a JSON text with or without the terminating zero that the library sends.
Json::Value Dispatch(const std::string& request, const Peer& peer, const JsonCommand& command,
                     std::initializer_list<const char*> of_engine) {
  const bool steers = IsRootOrOwner(peer);
  const bool is_obeyed = steers || (of_engine.size() != 0 && IsEngine(peer));
  FERROX_FAIL_IF(!is_obeyed, Error::kEngineNotPermitted, kNotObeyed);
  FERROX_FAIL_IF(CountJsonValues(request) > kValuesMax, Error::kBadArgument,
                 "the request has too many values; no command needs more than " + std::to_string(kValuesMax));
  const size_t end = request.find_last_not_of('\0');
  Json::Value json;
  const bool parsed = fromString(json, request.substr(0, end == std::string::npos ? 0 : end + 1)) && json.isObject();
  FERROX_FAIL_IF(!parsed, Error::kBadArgument, "the request is not a JSON object");
  std::string type;
  GetJsonValue(type, json, "type", true);
  const bool may =
      steers || std::any_of(of_engine.begin(), of_engine.end(), [&](const char* one) { return type == one; });
  FERROX_FAIL_IF(!may, Error::kEngineNotPermitted, kNotObeyed);
  return command(type, json["data"]);
}

}  // namespace

bool IsRootOrOwner(const Peer& peer) { return peer.uid == 0 || peer.uid == geteuid(); }

std::string AnswerJsonCommand(const std::string& request, const Peer& peer, const JsonCommand& command,
                              std::initializer_list<const char*> of_engine) {
  try {
    Json::Value reply;
    reply["data"] = Dispatch(request, peer, command, of_engine);
    reply["success"] = true;
    return toString(reply);
  } catch (const Error& error) {
    return toString(ErrorReply(error.Code(), error.what()));
  } catch (const std::exception& error) {
    return toString(ErrorReply(Error::kInternal, error.what()));
  }
}

}  // namespace ferrox::services
