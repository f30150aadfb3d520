#include "services/kovawebd/service.h"

#include <unistd.h>

#include <utility>

#include "base/text.h"
#include "common/json_util.h"
#include "services/kovawebd/engine.h"
#include "services/kovawebd/host_rules.h"
#include "services/kovawebd/openapi.h"
#include "services/kovawebd/query_string.h"
#include "services/kovawebd/routes.h"
#include "services/kovawebd/token_routes.h"

namespace ferrox::web {

namespace {

/// Names of files may be any bytes, JSON is UTF-8: what is none becomes U+FFFD.
std::string AsUtf8(std::string_view text) {
  std::string out;
  out.reserve(text.size() + 1);
  while (!text.empty()) {
    const size_t bytes = base::CharacterBytes(text);
    out += bytes == 0 ? "\xEF\xBF\xBD" : text.substr(0, bytes);
    text.remove_prefix(bytes == 0 ? 1 : bytes);
  }
  return out;
}

}  // namespace

Service::Service(Options options, Tokens& tokens)
    : options_(std::move(options)), tokens_(tokens), routes_(MakeRoutes()) {}

std::vector<Route> Service::MakeRoutes() const {
  std::vector<Route> routes = SearchRoutes();
  for (Route& route : TokenRoutes(tokens_)) routes.push_back(std::move(route));
  routes.push_back({"GET",
                    "/api/v1/status",
                    "status",
                    "That the daemon answers, where, and whether the search engine does.",
                    Route::For::kUser,
                    {},
                    {},
                    [this](const Call& call) { return Status(call); }});
  routes.push_back(
      {"GET", "/api/v1/openapi.json", "openapi", "This description.", Route::For::kAnyone, {}, {}, [this](const Call&) {
         return DescribeApi(routes_, FERROX_VERSION);
       }});
  return routes;
}

/// @throws Problem 401, 403.
Who Service::Identify(const Request& request, const Route& route) const {
  if (route.whom == Route::For::kAnyone) return {};
  if (request.local_user.has_value()) return {*request.local_user, false};
  const Who who = WhoBringsToken(request, tokens_);
  if (route.whom == Route::For::kLocal) throw Problem{403, "tokens are made, listed and revoked on the Unix socket"};
  return who;
}

/// A token is good as long as its user is answered: the engine is asked here, too.
Json::Value Service::Status(const Call& call) const {
  if (call.who.by_token) (void)AskEngineFor(call.who, "shares", Json::Value(Json::objectValue));
  Json::Value status;
  status["pid"] = getpid();
  status["version"] = FERROX_VERSION;
  status["engine"] = IsEngineRunning();
  status["addresses"] = Json::Value(Json::arrayValue);
  for (const std::string& address : options_.addresses) status["addresses"].append("http://" + address);
  return status;
}

Response Service::Handle(const Request& request) const {
  CheckHost(request, options_.hosts);
  const Found found = FindRoute(routes_, request.method, ReadTarget(request.target).path);
  const Who who = Identify(request, *found.route);
  Call call = ReadCall(*found.route, found, request.target, request.body);
  call.who = who;
  const wire::CancellationScope scope(cancellation_);
  Response response;
  response.body = AsUtf8(toString(found.route->answer(call))) + "\n";
  return response;
}

}  // namespace ferrox::web
