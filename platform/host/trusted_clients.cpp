#include "platform/host/trusted_clients.h"

#include <pwd.h>
#include <syslog.h>

#include <algorithm>
#include <cstdio>
#include <memory>
#include <string>

#include "platform/host/configuration.h"
#include "platform/host/log.h"

namespace kova::host {

namespace {

/// The uids of local accounts; of a name that is not there, none.
std::vector<uid_t> LocalUids(const std::vector<std::string>& names) {
  std::vector<uid_t> uids;
  std::vector<std::string> missing = names;
  const std::unique_ptr<FILE, int (*)(FILE*)> file(fopen("/etc/passwd", "re"), &fclose);
  std::vector<char> buffer(64U << 10);
  passwd entry = {};
  passwd* found = nullptr;
  while (file != nullptr && fgetpwent_r(file.get(), &entry, buffer.data(), buffer.size(), &found) == 0) {
    if (std::erase(missing, std::string(entry.pw_name)) != 0) uids.push_back(entry.pw_uid);
  }
  for (const std::string& name : missing) {
    LogChange(LOG_ERR, "trusted client " + name,
              "the settings name a trusted client \"" + name + "\", which has no account in /etc/passwd");
  }
  return uids;
}

}  // namespace

TrustedClients GetTrustedClients() {
  const std::shared_ptr<const Configuration> settings = GetConfiguration();
  if (!settings->problem.empty() || settings->trusted_clients.empty()) return {{}, settings->least_user};
  return {LocalUids(settings->trusted_clients), settings->least_user};
}

}  // namespace kova::host
