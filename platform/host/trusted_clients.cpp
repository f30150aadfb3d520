#include "platform/host/trusted_clients.h"

#include <pwd.h>
#include <syslog.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <memory>
#include <optional>
#include <string>

#include "base/mutex.h"
#include "platform/host/configuration.h"
#include "platform/host/log.h"

namespace kova::host {

namespace {

constexpr std::chrono::seconds kReadAgain{1};

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

TrustedClients ReadTrustedClients() {
  const std::shared_ptr<const Configuration> settings = GetConfiguration();
  if (!settings->problem.empty() || settings->trusted_clients.empty()) return {{}, settings->least_user};
  return {LocalUids(settings->trusted_clients), settings->least_user};
}

struct LastRead {
  base::Mutex mutex;
  std::optional<std::chrono::steady_clock::time_point> at BASE_GUARDED_BY(mutex);
  TrustedClients clients BASE_GUARDED_BY(mutex);
};

}  // namespace

TrustedClients GetTrustedClients() {
  static auto* last = new LastRead;  // never freed, like the settings
  const auto now = std::chrono::steady_clock::now();
  const base::MutexLock lock(last->mutex);
  if (!last->at.has_value() || now >= *last->at + kReadAgain) {
    last->clients = ReadTrustedClients();
    last->at = now;
  }
  return last->clients;
}

}  // namespace kova::host
