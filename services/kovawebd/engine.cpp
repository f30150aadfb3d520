#include "services/kovawebd/engine.h"

#include <unistd.h>

#include <utility>

#include "common/error.h"
#include "services/support/instance_owner.h"
#include "wire/engine_requests.h"
#include "wire/frame_client.h"

namespace ferrox::web {

namespace {

int StatusOf(int code) {
  switch (code) {
    case Error::kEngineBadRequest:
      return 400;
    case Error::kEngineNotPermitted:
      return 403;
    case Error::kEngineNoSuchIndex:
    case Error::kEngineNoSuchDocument:
      return 404;
    case Error::kEngineUserBusy:
      return 429;
    default:
      return 503;
  }
}

/// The engine looks the user up, and lets neither root nor the instance's owner be asked for.
void AddUser(const Who& who, Json::Value& data) {
  if (services::IsRootsInstance()) {
    data["as"]["user"] = Json::UInt(who.uid);
    return;
  }
  if (who.uid != geteuid()) throw Problem{403, "this instance belongs to one user, and answers nobody else"};
}

}  // namespace

Json::Value AskEngineFor(const Who& who, const char* command, Json::Value data, std::chrono::milliseconds longest) {
  AddUser(who, data);
  wire::Reply reply = wire::AskEngine(wire::EngineRequest(command, std::move(data)), longest);
  if (reply.outcome == wire::Outcome::kAnswered) return std::move(reply.data);
  if (reply.outcome != wire::Outcome::kRefused) {
    throw Problem{503, "the search engine does not answer; its administrator starts it with 'fileindexctl up'"};
  }
  throw Problem{StatusOf(reply.code), reply.message};
}

bool IsEngineRunning() {
  constexpr std::chrono::seconds kLongest(5);
  return wire::AskEngine(wire::EngineRequest("ping"), kLongest).outcome == wire::Outcome::kAnswered;
}

}  // namespace ferrox::web
