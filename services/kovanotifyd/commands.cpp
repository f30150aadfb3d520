#include "services/kovanotifyd/commands.h"

#include <unistd.h>

#include <json/value.h>

#include "common/error.h"
#include "common/json_util.h"
#include "services/support/json_command.h"

namespace ferrox::notifyd {

namespace {

constexpr int kSyncTimeoutMs = 30 * 1000;
constexpr int kSyncTimeoutMaxMs = 600 * 1000;

Json::Value ToJson(const QueueStatus::Watch& watch) {
  Json::Value value;
  value["path"] = watch.path;
  value["watch"] = watch.state.way;
  value["reason"] = watch.state.reason;
  value["covered"] = watch.state.covered;
  value["kernel_watches"] = Json::UInt64(watch.state.kernel_watches);
  return value;
}

Json::Value ToJson(const QueueStatus& queue) {
  Json::Value value;
  value["queue"] = queue.queue;
  value["application"] = queue.application;
  value["watches"] = Json::arrayValue;
  for (const QueueStatus::Watch& watch : queue.watches) value["watches"].append(ToJson(watch));
  value["written"] = Json::UInt64(queue.figures.written);
  value["held"] = Json::UInt64(queue.figures.held);
  value["held_since"] = Json::Int64(queue.figures.held_since);
  value["held_reason"] = queue.figures.held_reason;
  return value;
}

Json::Value OnSync(Notifier& notifier, const Json::Value& data) {
  int timeout_ms = kSyncTimeoutMs;
  GetJsonValue(timeout_ms, data, "timeout_ms", false);
  if (timeout_ms < 0 || timeout_ms > kSyncTimeoutMaxMs) {
    throw Error(Error::kBadArgument, "timeout_ms is not from 0 to " + std::to_string(kSyncTimeoutMaxMs));
  }
  Json::Value reply;
  reply["problems"] = Vec2JsonArr(notifier.Sync(std::chrono::milliseconds(timeout_ms)));
  return reply;
}

Json::Value OnStatus(Notifier& notifier, const Json::Value&) {
  const NotifierStatus status = notifier.Status();
  Json::Value reply;
  reply["pid"] = getpid();
  reply["queues"] = Json::arrayValue;
  for (const QueueStatus& queue : status.queues) reply["queues"].append(ToJson(queue));
  reply["changes"] = Json::UInt64(status.changes);
  reply["lost"] = Json::UInt64(status.lost);
  reply["problems"] = Vec2JsonArr(status.problems);
  return reply;
}

/// Takes the "data" of a request and gives that of the reply.
struct Command {
  const char* type;
  Json::Value (*run)(Notifier& notifier, const Json::Value& data);
};

constexpr Command kCommands[] = {
    {"sync", &OnSync},
    {"status", &OnStatus},
};

}  // namespace

std::string HandleCommand(Notifier& notifier, const std::string& request, const services::Peer& peer) {
  const auto answer = [&](const std::string& type, const Json::Value& data) {
    for (const Command& command : kCommands) {
      if (type == command.type) return command.run(notifier, data);
    }
    throw Error(Error::kBadArgument, "unknown command: " + type);
  };
  return services::AnswerJsonCommand(request, peer, answer, {"sync"});
}

}  // namespace ferrox::notifyd
