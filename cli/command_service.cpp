#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <iterator>
#include <string_view>
#include <vector>

#include <kova/service.h>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/format.h"
#include "common/clock.h"
#include "common/error.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/status_mgr.h"
#include "platform/host/child_service.h"
#include "services/support/daemon.h"
#include "services/support/instance_owner.h"

/// Starting and stopping the daemons, and pausing what they do. Where the host has a service manager it does the work;
/// elsewhere the daemons are children of the tool's, and a supervisor starts again what was killed.
namespace ferrox::cli {

namespace {

/// A daemon, and how the platform starts and stops it; two kinds of functions for two kinds of services.
struct Service {
  const char* name;
  const char* label;
  int (*start)(const char* name, int option);
  int (*stop)(const char* name, int option);
  int option;
};

constexpr char kAccess[] = "kova-access";

/// In the order in which they start: the index daemon needs the engine and content extraction, and reads the queues
/// that the notification daemon fills; all are there when others may ask over the network.
constexpr Service kServices[] = {
    {"kovaelasticd", "search engine", &KLIBServiceStart, &KLIBServiceStop, 1},
    {kAccess, "access check", &KLIBServiceStart, &KLIBServiceStop, 1},
    {"kovacontentextractd", "content extraction", &KLIBServiceStart, &KLIBServiceStop, 1},
    {"kovanotifyd", "notification daemon", &KLIBServiceStart, &KLIBServiceStop, 1},
    {"pkg-Ferrox-fileindexd", "index daemon", &KLIBServicectlStart, &KLIBServicectlStop, KLIB_SERVICECTL_UPSTART},
    {"kovawebd", "web daemon", &KLIBServiceStart, &KLIBServiceStop, 1},
};

constexpr Service kSupervisor = {"fileindex-supervisor", "supervisor", nullptr, nullptr, 0};

/// The daemons of this instance. One that is not root's has no users whose access there is to check.
std::vector<Service> Services() {
  std::vector<Service> services(std::begin(kServices), std::end(kServices));
  if (!services::IsRootsInstance())
    std::erase_if(services, [](const Service& one) { return std::string_view(one.name) == kAccess; });
  return services;
}

/// The platform says only that it failed; the host keeps why.
[[noreturn]] void ThrowProblem(const Service& service, const char* what) {
  const std::string reason = kova::host::LastServiceProblem();
  throw Failure(std::string("the ") + service.label + " could not be " + what + (reason.empty() ? "" : ": " + reason));
}

/// As the daemons' lines are written.
void ReportSupervisor(const char* what) { (void)printf("%s: %s\n", kSupervisor.label, what); }

/// systemd does it itself.
void StartSupervisor() {
  if (kova::host::HasServiceManager()) return;
  const bool ran = kova::host::ChildServicePid(kova::host::kSupervisor) != 0;
  if (kova::host::StartChildService(kova::host::kSupervisor) < 0) ThrowProblem(kSupervisor, "started");
  ReportSupervisor(ran ? "runs already" : "started");
}

/// Says nothing when there was none.
void StopSupervisor() {
  if (kova::host::HasServiceManager()) return;
  const bool ran = kova::host::ChildServicePid(kova::host::kSupervisor) != 0;
  if (kova::host::StopChildService(kova::host::kSupervisor) < 0) ThrowProblem(kSupervisor, "stopped");
  if (ran) ReportSupervisor("stopped");
}

/// A daemon that was not reached takes the pause from the status file when it starts.
int ReportPause(void (*change)(int hours), int hours, const std::string& report) {
  try {
    change(hours);
  } catch (const Error& error) {
    if (error.Code() != Error::kInternal) throw;
    (void)printf("%s (the index daemon does not run; it will see this when it starts)\n", report.c_str());
    return kDone;
  }
  (void)printf("%s\n", report.c_str());
  return kDone;
}

}  // namespace

/// In the order of the table, each when the one before it answers. One that runs already is left alone, so that the
/// command also mends an instance of which a part has stopped.
int RunUp(const Arguments& arguments) {
  services::GuardLockFiles();
  if (arguments.Has("--no-supervisor")) StopSupervisor();
  for (const Service& service : Services()) {
    const bool ran = KLIBServiceIsRunning(service.name) == 1;
    if (service.start(service.name, service.option) < 0) ThrowProblem(service, "started");
    (void)printf("%s: %s\n", service.label, ran ? "runs already" : "started");
  }
  if (!arguments.Has("--no-supervisor")) StartSupervisor();
  return kDone;
}

/// In the opposite order, so that each stops while those that it needs still answer.
int RunDown(const Arguments&) {
  StopSupervisor();  // first, or it would start them again
  std::vector<Service> services = Services();
  std::reverse(services.begin(), services.end());
  for (const Service& service : services) {
    const bool ran = KLIBServiceIsRunning(service.name) == 1;
    if (service.stop(service.name, service.option) < 0) ThrowProblem(service, "stopped");
    (void)printf("%s: %s\n", service.label, ran ? "stopped" : "does not run");
  }
  return kDone;
}

/// Goes by the list of indexed folders, and never fails for a service: what runs then is printed.
int RunPrepare(const Arguments&) {
  services::GuardLockFiles();
  fileindex::PrepareServices();
  if (!fileindex::FolderMgr().GetFolders().empty()) (void)KLIBServiceStart("kovanotifyd", 1);
  for (const Service& service : Services()) {
    (void)printf("%s: %s\n", service.label, KLIBServiceIsRunning(service.name) == 1 ? "runs" : "does not run");
  }
  return kDone;
}

/// The hours are a word and not an option; they are checked as if they were one. The status file has the deadline: a
/// daemon that starts later takes it from there.
int RunPause(const Arguments& arguments) {
  const std::string hours = arguments.words.empty() ? "0" : arguments.words[0];
  Arguments checked;
  checked.options["HOURS"] = hours;
  constexpr long long kHoursMax = 24 * 365;
  const auto length = static_cast<int>(checked.Number("HOURS", 0, 0, kHoursMax));
  const std::string report = length == 0 ? "indexing is paused until 'fileindexctl resume'"
                                         : "indexing is paused until " + Date(Clock::Get().Now() + 3600LL * length);
  return ReportPause([](int value) { fileindex::StatusMgr().Pause(value); }, length, report);
}

int RunResume(const Arguments&) {
  return ReportPause([](int) { fileindex::StatusMgr().Resume(); }, 0, "indexing is resumed");
}

}  // namespace ferrox::cli
