#include <unistd.h>

#include <span>
#include <string>

#include <kova/instance.h>
#include <kova/service.h>

#include "platform/host/child_service.h"
#include "platform/host/run_program.h"
#include "platform/shared/failure.h"

using kova::host::ServiceRow;

namespace {

constexpr ServiceRow kServices[] = {
    {"kovaelasticd", "kovaelasticd", "/var/run/kovaelasticd.sock", "kovaelasticd.service"},
    {"pkg-Ferrox-fileindexd", "fileindexd", "/var/run/fileindexd.sock", "fileindexd.service"},
    {"kovanotifyd", "kovanotifyd", "/var/run/kovanotifyd.sock", "kovanotifyd.service"},
    {"kova-access", "kova-access", "/var/run/kova-access.sock", "kova-access.service"},
    {"kovacontentextractd", "kovacontentextractd", "/var/run/kovacontentextractd.sock", "kovacontentextractd.service"},
    {"kovawebd", "kovawebd", "/var/run/kovawebd/sock", "kovawebd.service"},
};
/// The file-sharing service is the host's own; an instance cannot switch it.
constexpr ServiceRow kFileSharing = {"samba", nullptr, nullptr, "smbd.service"};

using kova::host::HasServiceManager;

bool IsInstalled(const ServiceRow& service) {
  for (const char* folder : {"/etc/systemd/system/", "/run/systemd/system/", "/usr/local/lib/systemd/system/",
                             "/usr/lib/systemd/system/", "/lib/systemd/system/"}) {
    if (access((folder + std::string(service.unit)).c_str(), F_OK) == 0) return true;
  }
  return false;
}

/// The service of that name; null, with the failure recorded, when this host does not have it.
const ServiceRow* Find(const char* name) {
  const std::string wanted = name != nullptr ? name : "";
  const ServiceRow* found = wanted == kFileSharing.name ? &kFileSharing : nullptr;
  for (const ServiceRow& row : kServices) {
    if (wanted == row.name) found = &row;
  }
  std::string problem;
  if (found == nullptr) {
    problem = "there is no service \"" + wanted + "\" here";
  } else if (HasServiceManager()) {
    if (!IsInstalled(*found)) problem = std::string("the service ") + found->unit + " is not installed";
  } else if (found == &kFileSharing) {
    problem = "the file-sharing service is the host's own and is not switched from here";
  }
  if (problem.empty()) return found;
  (void)kova::host::ServiceFailure(KOVA_ERR_NOT_SUPPORTED, problem);
  return nullptr;
}

int SystemctlStatus(const char* verb, const ServiceRow& service) {
  const char* path = access("/usr/bin/systemctl", X_OK) == 0 ? "/usr/bin/systemctl" : "/bin/systemctl";
  return kova::host::RunProgram(path, {"--quiet", verb, service.unit});
}

int Systemctl(const char* verb, const ServiceRow& service) {
  const int status = SystemctlStatus(verb, service);
  if (status == 0) return 0;
  return kova::host::ServiceFailure(KOVA_ERR_SYSTEM, std::string("systemctl ") + verb + " " + service.unit +
                                                         " failed; see journalctl -u " + service.unit);
}

int Start(const char* name) {
  const ServiceRow* service = Find(name);
  if (service == nullptr) return -1;
  return HasServiceManager() ? Systemctl("start", *service) : kova::host::StartChildService(*service);
}

int Stop(const char* name) {
  const ServiceRow* service = Find(name);
  if (service == nullptr) return -1;
  return HasServiceManager() ? Systemctl("stop", *service) : kova::host::StopChildService(*service);
}

}  // namespace

namespace kova::host {

std::span<const ServiceRow> ChildServices() { return kServices; }

bool HasServiceManager() { return InstanceRoot().empty() && access("/run/systemd/system", F_OK) == 0; }

}  // namespace kova::host

int KLIBServiceStart(const char* name, int now) {
  (void)now;
  return Start(name);
}

int KLIBServiceStop(const char* name, int now) {
  (void)now;
  return Stop(name);
}

int KLIBServiceRestart(const char* name) {
  const ServiceRow* service = Find(name);
  if (service == nullptr) return -1;
  if (HasServiceManager()) return Systemctl("restart", *service);
  return kova::host::StopChildService(*service) < 0 ? -1 : kova::host::StartChildService(*service);
}

int KLIBServicectlStart(const char* name, int kind) {
  (void)kind;
  return Start(name);
}

int KLIBServicectlStop(const char* name, int kind) {
  (void)kind;
  return Stop(name);
}

int KLIBServiceIsRunning(const char* name) {
  const ServiceRow* service = Find(name);
  if (service == nullptr) return -1;
  if (HasServiceManager()) return SystemctlStatus("is-active", *service) == 0 ? 1 : 0;
  return kova::host::ChildServicePid(*service) != 0 ? 1 : 0;
}
