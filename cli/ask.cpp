#include "cli/ask.h"

#include "cli/command.h"
#include "common/error.h"
#include "common/json_util.h"
#include "common/paths.h"
#include "services/support/local_request.h"

namespace ferrox::cli {

namespace {

using services::RequestResult;

/// A search that must first wait for other work still answers within this.
constexpr std::chrono::seconds kLongestWait(120);

struct Daemon {
  const char* name;
  const char* socket;
  int unreachable;  ///< what the library throws when it cannot reach it
};
constexpr Daemon kEngine = {"the search engine", kElasticdSocket, Error::kEngineUnreachable};
constexpr Daemon kIndexDaemon = {"the index daemon", kFileIndexdSocket, Error::kInternal};

Json::Value DataOf(const Daemon& daemon, const std::string& text) {
  Json::Value reply;
  bool success = false;
  if (!fromString(reply, text) || !reply.isObject()) {
    throw Failure(std::string(daemon.name) +
                  " gave an answer that cannot be read; restart it ('fileindexctl down', 'up')");
  }
  GetJsonValue(success, reply, "success", false);
  if (success) return reply["data"];
  std::string message = "the request failed";
  GetJsonValue(message, reply["error"], "msg", false);
  throw Failure(std::string(daemon.name) + ": " + message);
}

RequestResult Ask(const Daemon& daemon, const Json::Value& request, const std::string& end, std::string& reply) {
  return services::AskLocally(InstancePath(daemon.socket), toString(request) + end, kLongestWait, reply);
}

Json::Value Answer(const Daemon& daemon, RequestResult result, const std::string& reply) {
  const std::string code = " (error " + std::to_string(daemon.unreachable) + ")";
  if (result == RequestResult::kNotRunning) {
    throw Failure(std::string(daemon.name) + " does not run here (nothing answers at " + InstancePath(daemon.socket) +
                  "); start it with 'fileindexctl up'" + code);
  }
  if (result == RequestResult::kNoAnswer) {
    throw Failure(std::string(daemon.name) + " did not answer; see its log, or restart it ('fileindexctl down', 'up')" +
                  code);
  }
  return DataOf(daemon, reply);
}

Json::Value IndexDaemonRequest(const std::string& type, const Json::Value& data) {
  Json::Value request;
  request["type"] = type;
  request["data"] = data;
  return request;
}

const std::string kTerminatingZero(1, '\0');

}  // namespace

Json::Value AskEngine(const std::string& command, const Json::Value& data) {
  Json::Value request;
  request["command"] = command;
  request["data"] = data;
  std::string reply;
  const RequestResult result = Ask(kEngine, request, "", reply);
  return Answer(kEngine, result, reply);
}

Json::Value AskIndexDaemon(const std::string& type, const Json::Value& data) {
  std::string reply;
  const RequestResult result = Ask(kIndexDaemon, IndexDaemonRequest(type, data), kTerminatingZero, reply);
  return Answer(kIndexDaemon, result, reply);
}

Json::Value AskIndexDaemonIfRunning(const std::string& type, const Json::Value& data) {
  std::string reply;
  const RequestResult result = Ask(kIndexDaemon, IndexDaemonRequest(type, data), kTerminatingZero, reply);
  return result == RequestResult::kNotRunning ? Json::Value() : Answer(kIndexDaemon, result, reply);
}

void RequireEngine() { (void)AskEngine("ping", Json::Value(Json::objectValue)); }

void RequireIndexDaemon() { (void)AskIndexDaemon("status", Json::Value()); }

Json::Value ShareName(const std::string& name) {
  Json::Value data;
  data["share_name"] = name;
  return data;
}

void NotifySettingChanged(const std::string& share) {
  Json::Value data = ShareName(share);
  data["is_upsert"] = true;
  (void)AskIndexDaemonIfRunning("notify_setting_changed", data);
}

}  // namespace ferrox::cli
