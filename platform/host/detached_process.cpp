#include "platform/host/detached_process.h"

#include <fcntl.h>
#include <linux/close_range.h>
#include <poll.h>
#include <signal.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <vector>

#include "base/files.h"
#include "base/path.h"
#include "base/unique_fd.h"
#include "platform/host/run_program.h"

namespace kova::host {

namespace {

/// What the new process tells its starter: who it is, and why it could not become the program (0: it did).
struct StartReport {
  pid_t pid;
  int error;
};

/// The environment without what a service manager said to this process only.
std::vector<std::string> Environment() {
  std::vector<std::string> environment;
  for (char** entry = environ; *entry != nullptr; ++entry) {
    const bool private_entry = strncmp(*entry, "NOTIFY_SOCKET=", 14) == 0 || strncmp(*entry, "LISTEN_", 7) == 0;
    if (!private_entry) environment.emplace_back(*entry);
  }
  return environment;
}

// From here to Become: between fork and exec, only what a signal handler may do.

void CloseOnExecFrom(unsigned first) {
  if (syscall(SYS_close_range, first, ~0U, CLOSE_RANGE_CLOEXEC) == 0) return;
  for (unsigned fd = first; fd < 4096; ++fd) (void)fcntl(static_cast<int>(fd), F_SETFD, FD_CLOEXEC);
}

void UsualSignals() {
  for (const int number : {SIGPIPE, SIGHUP, SIGINT, SIGQUIT, SIGTERM, SIGCHLD, SIGUSR1, SIGUSR2}) {
    (void)signal(number, SIG_DFL);
  }
  sigset_t none;
  (void)sigemptyset(&none);
  (void)sigprocmask(SIG_SETMASK, &none, nullptr);
}

[[noreturn]] void Become(char* const* argv, char* const* environment, int null_fd, int log_fd, int report_fd) {
  StartReport report = {getpid(), 0};
  const bool ready = dup2(null_fd, STDIN_FILENO) >= 0 && dup2(log_fd, STDOUT_FILENO) >= 0 &&
                     dup2(log_fd, STDERR_FILENO) >= 0 && chdir("/") == 0;
  if (ready) {
    CloseOnExecFrom(STDERR_FILENO + 1);
    UsualSignals();
    (void)!write(report_fd, &report, sizeof(report));
    (void)execve(argv[0], argv, environment);
  }
  report.error = errno;
  (void)!write(report_fd, &report, sizeof(report));
  _exit(127);
}

/// Forks twice, so that the new process is nobody's child and leads no session that could get a terminal.
pid_t ForkTwice(char* const* argv, char* const* environment, int null_fd, int log_fd, int report_fd) {
  const pid_t between = fork();
  if (between != 0) return between;
  (void)setsid();
  const pid_t last = fork();
  if (last == 0) Become(argv, environment, null_fd, log_fd, report_fd);
  _exit(last < 0 ? 1 : 0);
}

/// Reads until the program runs (its end of the pipe closes) or could not be run.
pid_t ReadReports(int fd) {
  StartReport report = {-1, EAGAIN};
  for (;;) {
    StartReport next = {};
    const ssize_t got = read(fd, &next, sizeof(next));
    if (got < 0 && errno == EINTR) continue;
    if (got != sizeof(next)) break;
    report = next;
  }
  errno = report.error;
  return report.error == 0 ? report.pid : -1;
}

int OpenLog(const std::string& path) {
  if (!base::MakeFoldersDurably(base::FolderOf(path), 0755)) return -1;
  return open(path.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC | O_NOFOLLOW, 0640);
}

}  // namespace

pid_t StartDetached(const std::string& program, const std::string& log_path) {
  const base::UniqueFd log_file(OpenLog(log_path));
  const base::UniqueFd null_file(open("/dev/null", O_RDONLY | O_CLOEXEC));
  int ends[2];
  if (!log_file.Valid() || !null_file.Valid() || pipe2(ends, O_CLOEXEC) != 0) return -1;
  const base::UniqueFd reading(ends[0]);
  base::UniqueFd writing(ends[1]);
  const std::vector<std::string> arguments = {program};
  const std::vector<std::string> environment = Environment();
  const std::vector<char*> argv = ArgumentVector(arguments);
  const std::vector<char*> envp = ArgumentVector(environment);
  const pid_t between = ForkTwice(argv.data(), envp.data(), null_file.Get(), log_file.Get(), writing.Get());
  if (between < 0) return -1;
  (void)writing.Close();
  while (waitpid(between, nullptr, 0) < 0 && errno == EINTR) {
  }
  return ReadReports(reading.Get());
}

ProcessHandle::ProcessHandle(pid_t pid) : pid_(pid), fd_(static_cast<int>(syscall(SYS_pidfd_open, pid, 0))) {}

ProcessHandle::~ProcessHandle() {
  if (fd_ >= 0) (void)close(fd_);
}

bool ProcessHandle::WaitForEnd(int timeout_ms) const {
  if (fd_ >= 0) {
    pollfd state = {fd_, POLLIN, 0};
    return poll(&state, 1, timeout_ms) > 0;
  }
  if (kill(pid_, 0) != 0 && errno == ESRCH) return true;
  (void)poll(nullptr, 0, timeout_ms);
  return kill(pid_, 0) != 0 && errno == ESRCH;
}

bool ProcessHandle::Signal(int number) const {
  if (fd_ >= 0) return syscall(SYS_pidfd_send_signal, fd_, number, nullptr, 0) == 0;
  return kill(pid_, number) == 0;
}

}  // namespace kova::host
