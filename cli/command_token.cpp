#include <cstdio>
#include <string>
#include <utility>

#include <json/value.h>

#include "cli/escape.h"
#include "cli/format.h"
#include "cli/output.h"
#include "cli/rights.h"
#include "cli/token_commands.h"
#include "cli/web_client.h"
#include "common/paths.h"
#include "services/support/web_user.h"

/// What users do with their tokens: all of it is the web daemon's, which knows from the kernel who asks.
namespace ferrox::cli {

namespace {

constexpr long long kDaysOfToken = 365, kDaysOfTokenMax = 3650;
constexpr char kTokensTarget[] = "/api/v1/tokens";

/// The answer. @throws Failure, NotPermitted in the daemon's words, UsageError for what it cannot read.
Json::Value AskForTokens(const char* method, const std::string& target, const Json::Value& body = Json::Value()) {
  constexpr std::chrono::seconds kLongest(30);
  WebReply reply = AskWebDaemon(method, target, body, kLongest);
  using Outcome = WebReply::Outcome;
  if (reply.outcome == Outcome::kNotPermitted) throw MayNot("use", InstancePath(services::kWebSocket));
  if (reply.outcome == Outcome::kNotRunning) {
    throw Failure("the web daemon does not run here; its administrator starts it with 'fileindexctl up'");
  }
  if (reply.outcome != Outcome::kAnswered) throw Failure("the web daemon gives no answer; see its log");
  if (reply.status == 200) return std::move(reply.body);
  const std::string detail = EscapeForTerminal(TextOf(reply.body, "detail"));
  if (reply.status == 400) throw UsageError(detail);
  if (reply.status == 403) throw NotPermitted(detail);
  throw Failure(detail);
}

int RunTokenCreate(const Arguments& arguments) {
  Json::Value body;
  body["name"] = arguments.words[0];
  body["days"] = Json::Int64(arguments.Number("--days", kDaysOfToken, 1, kDaysOfTokenMax));
  const Json::Value made = AskForTokens("POST", kTokensTarget, body);
  (void)printf("%s\n", EscapeForTerminal(TextOf(made, "token")).c_str());
  (void)fflush(stdout);
  (void)fprintf(stderr, "It is shown only now, and good until %s; 'fileindexctl token revoke %s' ends it.\n",
                Date(IntOf(made, "expires")).c_str(), EscapeForTerminal(TextOf(made, "id")).c_str());
  return kDone;
}

int RunTokenList(const Arguments& arguments) {
  const Json::Value answer = AskForTokens("GET", kTokensTarget);
  if (arguments.Has("--json")) {
    PrintJson(answer);
    return kDone;
  }
  for (const Json::Value& token : answer["tokens"]) {
    (void)printf("%s  user %lld, until %s  %s\n", EscapeForTerminal(TextOf(token, "id")).c_str(),
                 static_cast<long long>(IntOf(token, "user")), Date(IntOf(token, "expires")).c_str(),
                 EscapeForTerminal(TextOf(token, "name")).c_str());
  }
  if (answer["tokens"].empty()) (void)printf("there are no tokens\n");
  return kDone;
}

int RunTokenRevoke(const Arguments& arguments) {
  const std::string& id = arguments.words[0];
  if (id.empty() || id.find_first_not_of("0123456789abcdef") != std::string::npos) {
    throw UsageError("\"" + EscapeForTerminal(id) + "\" is no id of a token; 'fileindexctl token list' shows them");
  }
  (void)AskForTokens("DELETE", kTokensTarget + ("/" + id));
  (void)printf("token %s is good for nothing any more\n", id.c_str());
  return kDone;
}

}  // namespace

CommandGroup TokenCommands() {
  return {
      "Searching by HTTP",
      {{"token create",
        "NAME",
        {{"--days", "N", "how long it is good (default 365, at most 3650)"}},
        "Makes a token by which a program searches as you over HTTP, and prints it: it is never shown again.",
        &RunTokenCreate,
        Needs::kNothing},
       {"token list",
        "",
        {{"--json", nullptr, "one line of JSON, for scripts"}},
        "Lists your tokens; for root those of all users.",
        &RunTokenList,
        Needs::kNothing},
       {"token revoke", "ID", {}, "Ends a token at once; root may end anybody's.", &RunTokenRevoke, Needs::kNothing}}};
}

}  // namespace ferrox::cli
