#include "services/kovawebd/token_routes.h"

#include <strings.h>

#include <optional>
#include <string_view>

#include "common/clock.h"
#include "services/kovawebd/engine.h"

namespace ferrox::web {

namespace {

constexpr int64_t kDaysDefault = 365;

/// For who is answered at all, which the engine knows.
Json::Value CreateToken(Tokens& tokens, const Call& call) {
  (void)AskEngineFor(call.who, "shares", Json::Value(Json::objectValue));
  const int64_t now = Clock::Get().Now();
  const int64_t days = call.body.get("days", Json::Int64(kDaysDefault)).asInt64();
  const Tokens::Made made = tokens.Create(call.who.uid, call.body["name"].asString(), now, now + days * kDaySec);
  Json::Value answer = ToJson(made.token);
  answer["token"] = made.secret;
  return answer;
}

Json::Value ListTokens(const Tokens& tokens, const Call& call) {
  Json::Value answer;
  answer["tokens"] = Json::Value(Json::arrayValue);
  for (const Token& token : tokens.Of(call.who.uid)) answer["tokens"].append(ToJson(token));
  return answer;
}

Json::Value RevokeToken(Tokens& tokens, const Call& call) {
  if (!tokens.Revoke(call.who.uid, call.last)) throw Problem{404, "you have no token of that id"};
  Json::Value answer;
  answer["revoked"] = call.last;
  return answer;
}

}  // namespace

std::vector<Route> TokenRoutes(Tokens& tokens) {
  using Kind = Parameter::Kind;
  return {
      {"POST",
       "/api/v1/tokens",
       "createToken",
       "Makes a token of the user who asks; only this answer has it.",
       Route::For::kLocal,
       {},
       {{.name = "name", .description = "What the user calls it", .required = true, .high = 100},
        {.name = "days", .kind = Kind::kNumber, .description = "How long it is good, by default 365", .high = 3650}},
       [&tokens](const Call& call) { return CreateToken(tokens, call); }},
      {"GET",
       "/api/v1/tokens",
       "listTokens",
       "The tokens of the user who asks, of root those of all.",
       Route::For::kLocal,
       {},
       {},
       [&tokens](const Call& call) { return ListTokens(tokens, call); }},
      {"DELETE",
       "/api/v1/tokens/{id}",
       "revokeToken",
       "Ends a token.",
       Route::For::kLocal,
       {},
       {},
       [&tokens](const Call& call) { return RevokeToken(tokens, call); }}};
}

Who WhoBringsToken(const Request& request, const Tokens& tokens) {
  constexpr std::string_view kScheme = "Bearer ";
  const std::string given = request.authorizations.size() == 1 ? request.authorizations.front() : "";
  const bool is_bearer =
      given.size() > kScheme.size() && strncasecmp(given.c_str(), kScheme.data(), kScheme.size()) == 0;
  const std::optional<Token> token =
      is_bearer ? tokens.Find(given.substr(kScheme.size()), Clock::Get().Now()) : std::nullopt;
  if (!token.has_value()) {
    throw Problem{401,
                  "a token is needed that is neither expired nor revoked; 'fileindexctl token create NAME' makes one"};
  }
  return {token->user, true};
}

}  // namespace ferrox::web
