#include "services/kovawebd/host_rules.h"

#include <algorithm>
#include <string_view>

#include "common/file_util.h"

namespace ferrox::web {

namespace {

/// "name:80" without the port, "[::1]:80" without brackets; "" for what is neither.
std::string HostWithoutPort(std::string_view text) {
  const size_t bracket = text.find(']');
  const bool is_six = text.starts_with('[') && bracket != std::string_view::npos;
  const size_t colon = text.find(':', is_six ? bracket : 0);
  const std::string_view port = colon == std::string_view::npos ? "" : text.substr(colon + 1);
  const bool digits = std::all_of(port.begin(), port.end(), [](char c) { return c >= '0' && c <= '9'; });
  if (!digits || port.size() > 5 || (is_six && colon != bracket + 1 && bracket + 1 != text.size())) return "";
  std::string host(is_six ? text.substr(1, bracket - 1) : text.substr(0, colon));
  std::transform(host.begin(), host.end(), host.begin(), &ToLowerAscii);
  return host;
}

bool IsOurs(const std::string& host, const Request& request, const std::vector<std::string>& names) {
  if (host.empty()) return false;
  return host == request.local_address || std::any_of(names.begin(), names.end(), [&host](std::string name) {
           std::transform(name.begin(), name.end(), name.begin(), &ToLowerAscii);
           return name == host;
         });
}

std::string HostOfOrigin(const std::string& origin) {
  for (const std::string_view scheme : {"http://", "https://"}) {
    if (origin.starts_with(scheme)) return HostWithoutPort(std::string_view(origin).substr(scheme.size()));
  }
  return "";
}

}  // namespace

void CheckHost(const Request& request, const std::vector<std::string>& names) {
  if (request.local_user.has_value()) return;
  if (request.hosts.size() != 1) throw Problem{400, "a request has one Host"};
  if (!IsOurs(HostWithoutPort(request.hosts.front()), request, names)) {
    throw Problem{421, "this is not a host that is served here; \"hosts\" of \"web\" in the settings names them"};
  }
  for (const std::string& origin : request.origins) {
    if (!IsOurs(HostOfOrigin(origin), request, names)) throw Problem{421, "pages of another host may not ask here"};
  }
}

}  // namespace ferrox::web
