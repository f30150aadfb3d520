#include <unistd.h>

#include <cstring>
#include <string>

#include <kova/instance.h>
#include <kova/service.h>

#include "platform/base/failure.h"
#include "platform/host/child_service.h"
#include "platform/host/run_program.h"

using kova::host::ServiceRow;

namespace {

constexpr ServiceRow kServices[] = {
    {"kovaelasticd", "kovaelasticd", "/var/run/kovaelasticd.sock", "kovaelasticd.service"},
    {"pkg-Ferrox-fileindexd", "fileindexd", "/var/run/fileindexd.sock", "fileindexd.service"},
    {"kovanotifyd", "kovanotifyd", nullptr, "kovanotifyd.service"},
    {"kovacontentextractd", "kovacontentextractd", nullptr, "kovacontentextractd.service"},
};
/// The file-sharing service is the host's own; an instance cannot switch it.
constexpr ServiceRow kFileSharing = {"samba", nullptr, nullptr, "smbd.service"};

bool HasServiceManager() { return kova::InstanceRoot().empty() && access("/run/systemd/system", F_OK) == 0; }

const ServiceRow* Find(const char* name) {
  for (const ServiceRow& row : kServices) {
    if (name != nullptr && strcmp(row.name, name) == 0) return &row;
  }
  if (name != nullptr && strcmp(kFileSharing.name, name) == 0 && HasServiceManager()) return &kFileSharing;
  (void)kova::host::ServiceFailure(KOVA_ERR_NOT_SUPPORTED,
                                   std::string("there is no service \"") + (name != nullptr ? name : "") + "\" here");
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
  return kova::host::IsChildServiceRunning(*service) ? 1 : 0;
}
