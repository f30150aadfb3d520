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

constexpr std::chrono::milliseconds kLookEvery(1000);
constexpr std::chrono::seconds kPauseMin(1), kPauseMax(60);

/// One service. The pause between two starts doubles until it has run for longer than the longest one.
class Watched {
 public:
  explicit Watched(const ServiceRow& service) : service_(&service) {}

  void Look() {
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
  SteadyClock::time_point next_ = SteadyClock::now();
  std::chrono::seconds pause_ = kPauseMin;
};

void Supervise() {
  ferrox::services::Daemon daemon(kova::host::kSupervisor.program);
  std::vector<Watched> services(kova::host::ChildServices().begin(), kova::host::ChildServices().end());
  daemon.NotifyReady();
  pollfd stop = {daemon.StopFd(), POLLIN, 0};
  // Whoever removes the folder of an instance has no other use for it.
  while (poll(&stop, 1, static_cast<int>(kLookEvery.count())) <= 0 && daemon.HasPidFile()) {
    for (Watched& service : services) service.Look();
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
