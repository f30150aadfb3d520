#include <poll.h>
#include <syslog.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <exception>
#include <vector>

#include "common/log.h"
#include "platform/host/child_service.h"
#include "platform/host/service_log.h"
#include "services/support/daemon.h"

namespace {

using SteadyClock = std::chrono::steady_clock;
using kova::host::ServiceRow;

constexpr char kHelp[] =
    "Usage: fileindex-supervisor\n"
    "Starts the daemons of this instance again when they end without having been stopped, where no service manager "
    "does.\n"
    "'fileindexctl up' starts it, 'fileindexctl down' ends it.\n"
    "  --help        this text\n"
    "  --version     the version\n"
    "The environment variable FERROX_ROOT chooses the instance.\n";

constexpr std::chrono::milliseconds kCheckInterval(1000);
/// The least time between two starts of a service: doubles from the first to the second while the service keeps dying.
constexpr std::chrono::seconds kPauseMin(1), kPauseMax(60);

/// One daemon of the instance, which is started again when its process has ended without 'fileindexctl down' or a
/// signal to stop. Its pid file tells (platform/host/child_service.h), so that the daemons need not be children.
class SupervisedService {
 public:
  explicit SupervisedService(const ServiceRow& service) : service_(&service) {}

  /// Called every second. Also keeps the service's log file within its bounds, which nothing else does where no service
  /// manager takes the log. A service that has run for longer than the longest pause starts anew with the shortest.
  void Check() {
    kova::host::BoundLog(kova::host::ServiceLogPath(service_->program));
    if (SteadyClock::now() < next_ || !kova::host::HasChildServiceDied(*service_)) return;
    if (SteadyClock::now() - next_ > kPauseMax) pause_ = kPauseMin;
    ferrox::Log(LOG_WARNING, "%s ended without having been stopped, and is started again", service_->program);
    if (kova::host::ReviveChildService(*service_) < 0) {
      ferrox::Log(LOG_ERR, "%s", kova::host::LastServiceProblem().c_str());
    }
    next_ = SteadyClock::now() + pause_;
    pause_ = std::min(2 * pause_, kPauseMax);
  }

 private:
  const ServiceRow* service_;
  SteadyClock::time_point next_ = SteadyClock::now();  ///< no start before
  std::chrono::seconds pause_ = kPauseMin;
};

/// Returns at a signal to stop, or when its pid file is gone: the folder of the instance was removed, and with it
/// what there was to supervise.
void Supervise() {
  ferrox::services::Daemon daemon(kova::host::kSupervisor.program);
  std::vector<SupervisedService> services(kova::host::ChildServices().begin(), kova::host::ChildServices().end());
  daemon.NotifyReady();
  pollfd stop = {daemon.StopFd(), POLLIN, 0};
  while (poll(&stop, 1, static_cast<int>(kCheckInterval.count())) <= 0 && daemon.HasPidFile()) {
    for (SupervisedService& service : services) service.Check();
  }
}

}  // namespace

int main(int argc, char** argv) try {
  if (argc == 2 && strcmp(argv[1], "--help") == 0) return fputs(kHelp, stdout) < 0 ? 3 : 0;
  if (argc == 2 && strcmp(argv[1], "--version") == 0) return printf("fileindex-supervisor %s\n", FERROX_VERSION) < 0;
  if (argc != 1) return fputs(kHelp, stderr) < 0 ? 3 : 2;
  Supervise();
  return 0;
} catch (const std::exception& error) {
  (void)fprintf(stderr, "fileindex-supervisor: %s\n", error.what());
  return 3;
}
