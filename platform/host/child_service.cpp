#include "platform/host/child_service.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <vector>

#include <kova/instance.h>
#include <kova/lock_holder.h>

#include "base/files.h"
#include "base/path.h"
#include "base/unique_fd.h"
#include "platform/host/detached_process.h"
#include "platform/host/log.h"
#include "platform/host/service_log.h"
#include "platform/shared/failure.h"
#include "platform/shared/frames.h"

namespace kova::host {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr std::chrono::seconds kStartMax{10};
constexpr std::chrono::seconds kStopMax{20};
constexpr std::chrono::seconds kKillMax{2};
constexpr std::chrono::seconds kOthersMax{35};  // another process that starts or stops the same service
constexpr int kPollMs = 10;

thread_local std::string t_problem;

std::string PidPath(const ServiceRow& service) { return InstanceRoot() + "/var/run/" + service.program + ".pid"; }

pid_t ReadPid(int fd) {
  char text[32] = {};
  if (pread(fd, text, sizeof(text) - 1, 0) <= 0) return 0;
  const long pid = strtol(text, nullptr, 10);
  return pid > 0 ? static_cast<pid_t>(pid) : 0;
}

/// Whether what the pid file says is to be believed. In an instance of root's the search engine may be a user of its
/// own, who can write its pid file, but must not have root signal other processes.
bool IsBelieved(const ServiceRow& service, int file, pid_t pid) {
  struct stat info = {}, folder = {}, process = {};
  if (fstat(file, &info) != 0 || stat(base::FolderOf(PidPath(service)).c_str(), &folder) != 0) return false;
  if (info.st_uid == 0 || info.st_uid == geteuid() || folder.st_uid != 0) return true;
  return stat(("/proc/" + std::to_string(pid)).c_str(), &process) == 0 && process.st_uid == info.st_uid;
}

/// The process that holds the service's pid file, or 0. The lock is only tried when the written process exists, so that
/// looking does not get in the way of a daemon that is just taking it.
pid_t RunningPid(const ServiceRow& service) {
  const base::UniqueFd file(open(PidPath(service).c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (!file.Valid() && errno == EACCES) {  // only its owner can open it
    const std::vector<LockHolder> holders = LockHolders(PidPath(service));
    return holders.empty() ? 0 : holders.front().pid;
  }
  if (!file.Valid()) return 0;
  const pid_t pid = ReadPid(file.Get());
  if (pid == 0 || (kill(pid, 0) != 0 && errno == ESRCH) || !IsBelieved(service, file.Get(), pid)) return 0;
  return flock(file.Get(), LOCK_SH | LOCK_NB) != 0 && errno == EWOULDBLOCK ? pid : 0;
}

/// Whether the service takes connections; one without a socket is ready when it runs.
bool Answers(const ServiceRow& service) {
  if (service.socket == nullptr) return true;
  const base::UniqueFd connection(ConnectUnixSocket(InstanceRoot() + service.socket));
  return connection.Valid();
}

/// The last line that is not empty of what a text file holds from byte `from` on.
std::string LastLine(const std::string& path, std::streamoff from) {
  constexpr std::streamoff kTailBytes = 4096;
  std::ifstream file(path, std::ios::binary | std::ios::ate);
  const std::streamoff size = file.tellg();
  (void)file.seekg(std::max(from <= size ? from : 0, size - kTailBytes));
  std::string line, last;
  while (std::getline(file, line)) {
    if (!line.empty()) last = line;
  }
  return last;
}

std::streamoff FileSize(const std::string& path) {
  struct stat info = {};
  return stat(path.c_str(), &info) == 0 ? info.st_size : 0;
}

/// Keeps other processes from starting or stopping the same service meanwhile: two that both find it stopped would
/// start it twice. The file stays; the kernel ends the lock with its holder.
class SwitchLock {
 public:
  explicit SwitchLock(const ServiceRow& service)
      : path_(InstanceRoot() + "/var/run/" + service.program + ".switch"),
        file_(open(path_.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600)) {}

  bool Take() {
    const auto deadline = SteadyClock::now() + kOthersMax;
    while (file_.Valid() && flock(file_.Get(), LOCK_EX | LOCK_NB) != 0) {
      if ((errno != EWOULDBLOCK && errno != EINTR) || SteadyClock::now() > deadline) return false;
      (void)poll(nullptr, 0, kPollMs);
    }
    return file_.Valid();
  }

  /// Why the lock could not be taken.
  std::string Problem() const {
    if (!file_.Valid()) return InstanceRoot() + "/var/run cannot be written";
    const std::string holder = LockHolderText(path_);
    return "another start or stop of it hangs" + (holder.empty() ? "" : ": " + holder + " on " + path_);
  }

 private:
  std::string path_;
  base::UniqueFd file_;
};

int Ended(const ServiceRow& service, std::streamoff log_from) {
  const std::string log_path = ServiceLogPath(service.program);
  const std::string last = LastLine(log_path, log_from);
  return ServiceFailure(KOVA_ERR_SYSTEM, std::string(service.program) + " ended at once" +
                                             (last.empty() ? "" : ": " + last) + " (its log is " + log_path + ")");
}

int DoesNotAnswer(const ServiceRow& service) {
  return ServiceFailure(KOVA_ERR_SYSTEM, std::string(service.program) + " runs but does not answer after " +
                                             std::to_string(kStartMax.count()) + " s; see its log " +
                                             ServiceLogPath(service.program));
}

/// Waits until the service is up. `pid` is the process that is to become it; what it logs begins at byte `log_from`.
int WaitUntilReady(const ServiceRow& service, pid_t pid, std::streamoff log_from) {
  const ProcessHandle process(pid);
  const auto deadline = SteadyClock::now() + kStartMax;
  do {
    if (RunningPid(service) != 0 && Answers(service)) return 0;
    if (process.WaitForEnd(kPollMs)) return RunningPid(service) != 0 && Answers(service) ? 0 : Ended(service, log_from);
  } while (SteadyClock::now() < deadline);
  return DoesNotAnswer(service);
}

enum class Found { kAnswers, kMute, kGone };

/// Of a process that has the pid file already: it may be just beginning or ending. One that was killed keeps the file,
/// and even a socket that takes connections, until the last of its threads is gone.
Found WaitForRunning(const ServiceRow& service, pid_t pid) {
  const ProcessHandle process(pid);
  const auto deadline = SteadyClock::now() + kStartMax;
  while (RunningPid(service) == pid) {
    if (!IsEnding(pid) && Answers(service) && !IsEnding(pid)) return Found::kAnswers;
    if (SteadyClock::now() > deadline) return Found::kMute;
    (void)process.WaitForEnd(kPollMs);
  }
  return Found::kGone;
}

/// Under the lock that a start needs.
int StartLocked(const ServiceRow& service, const std::string& program) {
  for (pid_t pid = RunningPid(service); pid != 0; pid = RunningPid(service)) {
    const Found found = WaitForRunning(service, pid);
    if (found != Found::kGone) return found == Found::kAnswers ? 0 : DoesNotAnswer(service);
  }
  const std::string log_path = ServiceLogPath(service.program);
  BoundLog(log_path);
  const std::streamoff log_from = FileSize(log_path);
  const pid_t pid = StartDetached(program, log_path);
  if (pid < 0) return ServiceFailure(KOVA_ERR_SYSTEM, "cannot run " + program + ": " + strerror(errno));
  return WaitUntilReady(service, pid, log_from);
}

/// What was stopped is not taken for dead, however it ended.
void EmptyPidFile(const ServiceRow& service) {
  const base::UniqueFd file(open(PidPath(service).c_str(), O_WRONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  if (file.Valid() && flock(file.Get(), LOCK_EX | LOCK_NB) == 0) (void)!ftruncate(file.Get(), 0);
}

bool WaitUntilGone(const ServiceRow& service, pid_t pid, std::chrono::seconds longest) {
  const auto deadline = SteadyClock::now() + longest;
  while (RunningPid(service) == pid) {
    if (SteadyClock::now() > deadline) return false;
    (void)poll(nullptr, 0, kPollMs);
  }
  return true;
}

/// Takes the lock that a start or a stop needs, and the folders it needs.
int Prepare(const ServiceRow& service, SwitchLock& lock) {
  if (lock.Take()) return 0;
  return ServiceFailure(KOVA_ERR_SYSTEM, std::string(service.program) + " cannot be switched: " + lock.Problem());
}

}  // namespace

/// FERROX_LIBEXEC does not count in a process with raised privileges.
std::string FindProgram(const std::string& program) {
  std::string folders[4];
  const char* given = secure_getenv("FERROX_LIBEXEC");
  if (given != nullptr) folders[0] = given;
  char self[4096];
  const ssize_t length = readlink("/proc/self/exe", self, sizeof(self));
  if (length > 0 && static_cast<size_t>(length) < sizeof(self)) {
    folders[1] = base::FolderOf(std::string(self, static_cast<size_t>(length)));
    folders[2] = base::FolderOf(folders[1]) + "/sbin";
    folders[3] = base::FolderOf(folders[1]) + "/libexec";
  }
  for (const std::string& folder : folders) {
    const std::string path = folder + "/" + program;
    struct stat info = {};
    if (!folder.empty() && stat(path.c_str(), &info) == 0 && S_ISREG(info.st_mode) && access(path.c_str(), X_OK) == 0) {
      return path;
    }
  }
  return {};
}

std::string LastServiceProblem() { return t_problem; }

int ServiceFailure(int code, const std::string& problem) {
  t_problem = problem;
  if (code == KOVA_ERR_NOT_SUPPORTED) {
    LogChange(LOG_INFO, "services " + problem, problem);
  } else {
    LogLine(LOG_ERR, problem);
  }
  return KOVA_FAIL(code);
}

std::string ServiceLogPath(const std::string& program) { return InstanceRoot() + "/var/log/kova/" + program + ".log"; }

pid_t ChildServicePid(const ServiceRow& service) {
  const pid_t pid = RunningPid(service);
  return pid != 0 && !IsEnding(pid) ? pid : 0;
}

bool HasChildServiceDied(const ServiceRow& service) {
  const base::UniqueFd file(open(PidPath(service).c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  return file.Valid() && ReadPid(file.Get()) != 0 && ChildServicePid(service) == 0;
}

namespace {

int StartIf(const ServiceRow& service, bool (*wanted)(const ServiceRow&)) {
  const std::string program = FindProgram(service.program);
  if (program.empty()) {
    return ServiceFailure(KOVA_ERR_NOT_SUPPORTED, std::string(service.program) +
                                                      " is not installed beside this program; set FERROX_LIBEXEC to "
                                                      "the folder that holds it");
  }
  (void)base::MakeFoldersDurably(InstanceRoot() + "/var/run", 0755);  // a failure shows as that of the lock
  SwitchLock lock(service);
  if (Prepare(service, lock) < 0) return -1;
  return wanted(service) ? StartLocked(service, program) : 0;
}

}  // namespace

int StartChildService(const ServiceRow& service) {
  return StartIf(service, [](const ServiceRow&) { return true; });
}

int ReviveChildService(const ServiceRow& service) { return StartIf(service, &HasChildServiceDied); }

int StopChildService(const ServiceRow& service) {
  if (RunningPid(service) == 0 && access(PidPath(service).c_str(), F_OK) != 0) return 0;
  SwitchLock lock(service);
  if (Prepare(service, lock) < 0) return -1;
  const pid_t pid = RunningPid(service);
  const ProcessHandle process(pid);
  // The pid file is read again behind the handle: while that is open, no other process can get the number.
  if (pid == 0 || RunningPid(service) != pid) {
    EmptyPidFile(service);
    return 0;
  }
  if (!process.Signal(SIGTERM) && errno != ESRCH) {
    return ServiceFailure(KOVA_ERR_SYSTEM, std::string(service.program) + " (process " + std::to_string(pid) +
                                               ") cannot be told to stop: " + strerror(errno));
  }
  if (!WaitUntilGone(service, pid, kStopMax)) {
    (void)process.Signal(SIGKILL);
  }
  if (WaitUntilGone(service, pid, kKillMax)) {
    // It lets go of its pid file shortly before its end.
    (void)process.WaitForEnd(static_cast<int>(std::chrono::milliseconds(kKillMax).count()));
    EmptyPidFile(service);
    return 0;
  }
  return ServiceFailure(KOVA_ERR_SYSTEM, std::string(service.program) + " does not end");
}

}  // namespace kova::host
