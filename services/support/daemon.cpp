#include "services/support/daemon.h"

#include <fcntl.h>
#include <pthread.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <vector>

#include <kova/lock_holder.h>

#include "base/files.h"
#include "common/clock.h"
#include "common/log.h"
#include "common/paths.h"
#include "services/support/instance_owner.h"

namespace ferrox::services {

namespace {

base::UniqueFd BlockSignals() {
  (void)signal(SIGPIPE, SIG_IGN);
  sigset_t set;
  (void)sigemptyset(&set);
  for (const int number : {SIGTERM, SIGINT}) (void)sigaddset(&set, number);
  (void)pthread_sigmask(SIG_BLOCK, &set, nullptr);
  (void)signal(SIGHUP, SIG_IGN);
  return base::UniqueFd(signalfd(-1, &set, SFD_CLOEXEC | SFD_NONBLOCK));
}

/// Gives the threads that start from now on 2 MiB of stack each in place of the usual 8: there are many, they need
/// little, and the addresses of a 32-bit process would be used up by them.
void MakeStacksSmall() {
  constexpr size_t kStackBytes = 2 << 20;
  pthread_attr_t attributes;
  (void)pthread_attr_init(&attributes);
  (void)pthread_attr_setstacksize(&attributes, kStackBytes);
  (void)pthread_setattr_default_np(&attributes);
  (void)pthread_attr_destroy(&attributes);
}

/// Takes the lock, waiting for a holder that is ending: a process that was killed lets go of its locks only when the
/// last of its threads has ended, which takes seconds for a large one. False after a second when a process that is not
/// ending holds it.
bool LockWithPatience(int fd, const std::string& path) {
  constexpr int kAttempts = 20, kAttemptsOfEnding = 200;
  constexpr std::chrono::milliseconds kPause(50);
  for (int attempt = 1; flock(fd, LOCK_EX | LOCK_NB) != 0; ++attempt) {
    if (errno != EWOULDBLOCK || attempt == kAttemptsOfEnding) return false;
    const auto lives = [](const kova::LockHolder& holder) { return !kova::IsEnding(holder.pid); };
    const bool asks = attempt % kAttempts == 0;  // that looks at all processes
    const std::vector<kova::LockHolder> holders = asks ? kova::LockHolders(path) : std::vector<kova::LockHolder>();
    if (std::any_of(holders.begin(), holders.end(), lives)) return false;
    Clock::Get().SleepFor(kPause);
  }
  return true;
}

std::string PidPath(const std::string& name) { return InstancePath(("/var/run/" + name + ".pid").c_str()); }

/// The pid file of a running process is locked by it; what is written in it is only for people.
base::UniqueFd TakePidFile(const std::string& path, const std::string& name) {
  FERROX_FAIL_IF(!kova::MakeLockFilePrivate(path), Error::kInternal, "cannot make " + path + ": " + ErrnoText());
  base::UniqueFd file;
  do {  // it may just have been replaced
    file.Reset(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
    FERROX_FAIL_IF(!file.Valid(), Error::kInternal, "cannot open " + path + ": " + ErrnoText());
    const bool locked = LockWithPatience(file.Get(), path);
    const std::string holder = locked ? "" : kova::LockHolderText(path);
    FERROX_FAIL_IF(!locked, Error::kInternal,
                   name + " runs already in this instance (" + path + " is locked" +
                       (holder.empty() ? "" : ": " + holder) + "); stop it first");
  } while (!kova::IsStillAt(file.Get(), path));
  const std::string text = std::to_string(getpid()) + "\n";
  const bool written =
      ftruncate(file.Get(), 0) == 0 && write(file.Get(), text.data(), text.size()) == static_cast<ssize_t>(text.size());
  FERROX_FAIL_IF(!written, Error::kInternal, "cannot write " + path + ": " + ErrnoText());
  return file;
}

}  // namespace

void GuardLockFiles() {
  for (const char* path : {kFolderLockPath, kStatusLockPath}) {
    if (!kova::MakeLockFilePrivate(InstancePath(path))) {
      Log(LOG_WARNING, "others can hold the lock file %s, and it cannot be replaced: %s", InstancePath(path).c_str(),
          ErrnoText().c_str());
    }
  }
}

Daemon::Daemon(const std::string& name) : name_(name) {
  openlog(name_.c_str(), LOG_PID | (InstancePath("").empty() ? 0 : LOG_PERROR), LOG_DAEMON);
  const std::string problem = InstanceRootProblem();
  FERROX_FAIL_IF(!problem.empty(), Error::kInternal, problem);
  ClosePrivateFolders();
  for (const char* folder : {"/var/run", "/tmp", kConfigurationFolder}) {
    FERROX_FAIL_IF(!base::MakeFolders(InstancePath(folder)), Error::kInternal,
                   "cannot make " + InstancePath(folder) + ": " + ErrnoText());
  }
  MakeStacksSmall();
  stop_fd_ = BlockSignals();
  FERROX_FAIL_IF(!stop_fd_.Valid(), Error::kInternal, "signalfd: " + ErrnoText());
  pid_file_ = TakePidFile(PidPath(name_), name_);
  GuardLockFiles();
}

Daemon::~Daemon() {
  if (std::uncaught_exceptions() == 0) (void)!ftruncate(pid_file_.Get(), 0);
}

bool Daemon::HasPidFile() const { return kova::IsStillAt(pid_file_.Get(), PidPath(name_)); }

void Daemon::NotifyReady() {
  const char* address = getenv("NOTIFY_SOCKET");
  sockaddr_un target = {};
  if (address == nullptr || strlen(address) >= sizeof(target.sun_path)) return;
  target.sun_family = AF_UNIX;
  memcpy(target.sun_path, address, strlen(address));
  if (target.sun_path[0] == '@') target.sun_path[0] = '\0';
  const base::UniqueFd sender(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const char ready[] = "READY=1";
  const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + strlen(address));
  (void)sendto(sender.Get(), ready, sizeof(ready) - 1, MSG_NOSIGNAL, reinterpret_cast<const sockaddr*>(&target),
               length);
}

}  // namespace ferrox::services
