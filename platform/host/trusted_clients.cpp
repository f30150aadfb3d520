#include "platform/host/trusted_clients.h"

#include <pwd.h>
#include <shadow.h>
#include <syslog.h>

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "platform/host/configuration.h"
#include "platform/host/log.h"

namespace kova::host {

namespace {

struct FileClose {
  void operator()(FILE* file) const { (void)fclose(file); }
};

/// The entries of a file of accounts, each of which `read` takes as fgetpwent_r and fgetspent_r do.
template <typename Entry, typename Take>
void ForEachEntry(const char* path, int (*read)(FILE*, Entry*, char*, size_t, Entry**), Take take) {
  const std::unique_ptr<FILE, FileClose> file(fopen(path, "re"));
  std::vector<char> buffer(64U << 10);
  Entry entry = {};
  Entry* found = nullptr;
  while (file != nullptr && read(file.get(), &entry, buffer.data(), buffer.size(), &found) == 0) take(entry);
}

std::set<std::string> EndedAccounts() {
  constexpr long kSecondsOfDay = 24L * 60 * 60;
  const long today = static_cast<long>(time(nullptr) / kSecondsOfDay);
  std::set<std::string> names;
  ForEachEntry<spwd>("/etc/shadow", &fgetspent_r, [&](const spwd& entry) {
    if (entry.sp_expire >= 0 && entry.sp_expire <= today) names.insert(entry.sp_namp);
  });
  return names;
}

/// A name without a local account is nobody's.
TrustedClients FindAccounts(const std::vector<std::string>& names) {
  TrustedClients clients;
  const std::set<std::string> ended = EndedAccounts();
  std::vector<std::string> missing = names;
  ForEachEntry<passwd>("/etc/passwd", &fgetpwent_r, [&](const passwd& entry) {
    if (std::erase(missing, std::string(entry.pw_name)) != 0) clients.uids.push_back(entry.pw_uid);
    if (ended.contains(entry.pw_name)) clients.ended.push_back(entry.pw_uid);
  });
  for (const std::string& name : missing) {
    LogChange(LOG_ERR, "trusted client " + name,
              "the settings name a trusted client \"" + name + "\", which has no account in /etc/passwd");
  }
  return clients;
}

}  // namespace

TrustedClients GetTrustedClients(std::optional<uid_t> own_client) {
  const std::shared_ptr<const Configuration> settings = GetConfiguration();
  const bool none = !settings->problem.empty() || (settings->trusted_clients.empty() && !own_client.has_value());
  TrustedClients clients = none ? TrustedClients() : FindAccounts(settings->trusted_clients);
  if (!none && own_client.has_value()) clients.uids.push_back(*own_client);
  clients.least_user = settings->least_user;
  if (settings->problem.empty()) clients.memory_mib = settings->engine.memory_mib;
  return clients;
}

}  // namespace kova::host
