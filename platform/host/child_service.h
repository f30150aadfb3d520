#pragma once

#include <sys/types.h>

#include <span>
#include <string>

/// An instance's services without a service manager: processes that hold a lock on their pid file
/// "/var/run/<program>.pid" while they live, with their output in "/var/log/kova/<program>.log", both below the
/// instance's root. A program is looked for in the folder FERROX_LIBEXEC, beside the running program, and in "../sbin"
/// and "../libexec" from there.
namespace kova::host {

struct ServiceRow {
  const char* name;     ///< what callers say
  const char* program;  ///< what runs
  const char* socket;   ///< where it answers when it is ready; null: it has none
  const char* unit;     ///< its unit under systemd
};

/// What starts the others again when they end without having been stopped; "fileindexctl up" starts it.
inline constexpr ServiceRow kSupervisor = {"fileindex-supervisor", "fileindex-supervisor", nullptr, nullptr};

/// The services of an instance.
std::span<const ServiceRow> ChildServices();
/// Where a program is installed, "" when nowhere.
std::string FindProgram(const std::string& program);
/// Whether systemd runs them instead.
bool HasServiceManager();

/// Start and stop wait until it has happened, and do nothing when it was so already. 0, or below 0 with the failure
/// recorded and LastServiceProblem telling more.
int StartChildService(const ServiceRow& service);
int StopChildService(const ServiceRow& service);
/// The service's process, or 0. One that has been killed is none, although it may not be gone yet.
pid_t ChildServicePid(const ServiceRow& service);

/// Whether it has ended without having been stopped: its pid file, which an end in order empties, is not empty.
bool HasChildServiceDied(const ServiceRow& service);
/// Starts it if it has died.
int ReviveChildService(const ServiceRow& service);

/// What went wrong in this thread's last call that failed to start or stop a service: a sentence, with the last line of
/// the service's log where that tells the reason.
std::string LastServiceProblem();

/// Where the named program's output goes in this instance.
std::string ServiceLogPath(const std::string& program);

/// Records a sentence for LastServiceProblem and logs it; what this host does not have is said once. @return -1
int ServiceFailure(int code, const std::string& problem);

}  // namespace kova::host
