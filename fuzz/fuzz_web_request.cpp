#include <cstdint>
#include <cstdlib>
#include <string>
#include <utility>
#include <vector>

#include "services/kovawebd/host_rules.h"
#include "services/kovawebd/query_string.h"
#include "services/kovawebd/routes.h"
#include "services/kovawebd/token_routes.h"

// A request by TCP, before anybody is asked for it: lines of method, target, Host, Origin, Authorization, and the body
// behind them. Whatever they hold, it is refused as the client's mistake, or makes a call within its bounds.

namespace {

using namespace ferrox::web;

const std::vector<Route>& Table(Tokens& tokens) {
  static const std::vector<Route> table = [&tokens] {
    std::vector<Route> routes = SearchRoutes();
    for (Route& route : TokenRoutes(tokens)) routes.push_back(std::move(route));
    return routes;
  }();
  return table;
}

void Check(const Request& request, const Tokens& tokens, const std::vector<Route>& table) {
  CheckHost(request, {"localhost"});
  const std::string path = ReadTarget(request.target).path;
  const Found found = FindRoute(table, request.method, path);
  const Call call = ReadCall(*found.route, found, request.target, request.body);
  if (found.last.find('/') != std::string::npos || !path.starts_with('/')) abort();
  if (call.Number("limit", 1) < 1 || call.Number("limit", 1) > 2000 || call.Number("fresh", 0) > 60) abort();
  if (call.Text("q").size() > 4096 || call.Text("path").find('\0') != std::string::npos) abort();
  (void)WhoBringsToken(request, tokens);
  abort();  // there is no token that a request could bring
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static Tokens tokens("/nonexistent/tokens.json");
  std::string rest(reinterpret_cast<const char*>(data), size);
  const auto line = [&rest] {
    const size_t end = rest.find('\n');
    std::string text = rest.substr(0, end);
    rest.erase(0, end == std::string::npos ? end : end + 1);
    return text;
  };
  Request request;
  request.local_address = "127.0.0.1";
  request.method = line();
  request.target = line();
  request.hosts = {line()};
  if (std::string origin = line(); !origin.empty()) request.origins.push_back(std::move(origin));
  request.authorizations = {line()};
  request.body = rest;
  try {
    Check(request, tokens, Table(tokens));
  } catch (const Problem& problem) {
    if (problem.status < 400 || problem.status > 499) abort();
  }
  return 0;
}
