#include <cstdio>
#include <string>
#include <vector>

#include "cli/ask.h"
#include "cli/did_you_mean.h"
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

/// @throws Failure when it is none that the user may enter.
Json::Value OnlyShare(const Json::Value& shares, const std::string& name) {
  std::vector<std::string> names;
  Json::Value only(Json::arrayValue);
  for (const Json::Value& share : shares) {
    names.push_back(TextOf(share, "share"));
    if (names.back() == name) only.append(share);
  }
  if (only.empty()) throw Failure("there is no share \"" + name + "\" that you may enter" + DidYouMean(name, names));
  return only;
}

}  // namespace

int RunUserStatus(const Arguments& arguments) {
  constexpr std::chrono::seconds kLongest(20);
  Json::Value shares = AskEngine(wire::EngineRequest("shares"), kLongest);
  if (!arguments.words.empty()) shares = OnlyShare(shares, arguments.words[0]);
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
