#include <cstdio>

#include "cli/ask.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/output.h"
#include "cli/user_commands.h"
#include "wire/engine_requests.h"

/// What an ordinary user may know of the service: that it answers, and in which state the shares are that this user may
/// enter.
namespace ferrox::cli {

namespace {

/// "being prepared, 62 %", "cannot be searched: <reason>".
std::string StateText(const Json::Value& share) {
  const std::string state = TextOf(share, "state");
  std::string text = state;
  if (state == "ready") text = "can be searched";
  if (state == "preparing") text = "is being prepared";
  if (state == "indexing") text = "can be searched; is being indexed";
  if (state == "upgrading" || state == "rebuilding")
    text = "is being " + std::string(state == "upgrading" ? "upgraded" : "rebuilt");
  if (state == "refused" || state == "unavailable") text = "cannot be searched";
  if (share.isMember("percent")) text += ", " + std::to_string(UintOf(share, "percent")) + " %";
  const std::string reason = TextOf(share, "reason");
  return reason.empty() ? text : text + ": " + reason;
}

}  // namespace

int RunUserStatus(const Arguments& arguments) {
  constexpr std::chrono::seconds kLongest(20);
  const Json::Value shares = AskEngine(wire::EngineRequest("shares"), kLongest);
  if (arguments.Has("--json")) {
    Json::Value json;
    json["shares"] = shares.isArray() ? shares : Json::Value(Json::arrayValue);
    PrintJson(json);
    return kDone;
  }
  (void)printf("search engine: runs\n");
  for (const Json::Value& share : shares) {
    (void)printf("share %s: %s\n", EscapeForTerminal(TextOf(share, "share")).c_str(),
                 EscapeForTerminal(StateText(share)).c_str());
  }
  if (shares.empty()) (void)printf("there is no share that you may enter\n");
  return kDone;
}

}  // namespace ferrox::cli
