#include "platform/host/run_program.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <cstdarg>

#include <kova/service.h>

#include "base/unique_fd.h"
#include "platform/host/files.h"
#include "platform/shared/arguments.h"
#include "platform/shared/failure.h"

namespace kova::host {

namespace {

/// A program starts as from a shell: daemons block signals and ignore SIGPIPE, what they run must not.
class PlainSignals {
 public:
  PlainSignals() {
    sigset_t none, usual;
    (void)sigemptyset(&none);
    (void)sigemptyset(&usual);
    for (const int number : {SIGPIPE, SIGHUP, SIGINT, SIGQUIT, SIGTERM, SIGCHLD}) (void)sigaddset(&usual, number);
    (void)posix_spawnattr_init(&attributes_);
    (void)posix_spawnattr_setsigmask(&attributes_, &none);
    (void)posix_spawnattr_setsigdefault(&attributes_, &usual);
    (void)posix_spawnattr_setflags(&attributes_, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  }
  PlainSignals(const PlainSignals&) = delete;
  PlainSignals& operator=(const PlainSignals&) = delete;
  ~PlainSignals() { (void)posix_spawnattr_destroy(&attributes_); }

  const posix_spawnattr_t* Get() const { return &attributes_; }

 private:
  posix_spawnattr_t attributes_;
};

/// Standard output to a descriptor, the other standard streams from and to nowhere.
class OutputActions {
 public:
  explicit OutputActions(int output) {
    (void)posix_spawn_file_actions_init(&actions_);
    (void)posix_spawn_file_actions_addopen(&actions_, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    (void)posix_spawn_file_actions_adddup2(&actions_, output, STDOUT_FILENO);
    (void)posix_spawn_file_actions_addopen(&actions_, STDERR_FILENO, "/dev/null", O_WRONLY, 0);
  }
  OutputActions(const OutputActions&) = delete;
  OutputActions& operator=(const OutputActions&) = delete;
  ~OutputActions() { (void)posix_spawn_file_actions_destroy(&actions_); }

  const posix_spawn_file_actions_t* Get() const { return &actions_; }

 private:
  posix_spawn_file_actions_t actions_;
};

/// Starts a program; below 0, with the failure recorded, when it cannot be.
pid_t Spawn(const std::string& path, const std::vector<std::string>& arguments,
            const posix_spawn_file_actions_t* actions) {
  std::vector<std::string> texts = {path};
  texts.insert(texts.end(), arguments.begin(), arguments.end());
  const std::vector<char*> argv = ArgumentVector(texts);
  const PlainSignals signals;
  pid_t pid = -1;
  const int error = posix_spawn(&pid, path.c_str(), actions, signals.Get(), argv.data(), environ);
  if (error == 0) return pid;
  errno = error;
  return KOVA_FAIL_ERRNO();
}

int WaitFor(pid_t pid) {
  int status = 0;
  while (waitpid(pid, &status, 0) < 0) {
    if (errno != EINTR) return KOVA_FAIL_ERRNO();
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : KOVA_FAIL(KOVA_ERR_SYSTEM);
}

/// Reads until the other end is closed; false when that takes too long or too much.
bool ReadToEnd(int fd, std::string& output, std::chrono::seconds longest) {
  const auto deadline = std::chrono::steady_clock::now() + longest;
  for (;;) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    pollfd ready = {fd, POLLIN, 0};
    const int polled = left.count() > 0 ? poll(&ready, 1, static_cast<int>(left.count())) : 0;
    if (polled < 0 && errno == EINTR) continue;
    if (polled <= 0 || output.size() > kFileMaxBytes) return false;
    char buffer[16384];
    const ssize_t got = read(fd, buffer, sizeof(buffer));
    if (got == 0) return true;
    if (got < 0 && errno != EINTR) return false;
    if (got > 0) output.append(buffer, static_cast<size_t>(got));
  }
}

}  // namespace

std::vector<char*> ArgumentVector(const std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  pointers.reserve(texts.size() + 1);
  for (const std::string& text : texts) pointers.push_back(const_cast<char*>(text.c_str()));
  pointers.push_back(nullptr);
  return pointers;
}

int RunProgram(const std::string& path, const std::vector<std::string>& arguments) {
  const pid_t pid = Spawn(path, arguments, nullptr);
  return pid < 0 ? -1 : WaitFor(pid);
}

int RunForOutput(const std::string& path, const std::vector<std::string>& arguments, std::string& output,
                 std::chrono::seconds longest) {
  output.clear();
  int ends[2] = {-1, -1};
  if (pipe2(ends, O_CLOEXEC) != 0) return KOVA_FAIL_ERRNO();
  const base::UniqueFd read_end(ends[0]);
  pid_t pid = -1;
  {
    const base::UniqueFd write_end(ends[1]);
    const OutputActions actions(write_end.Get());
    pid = Spawn(path, arguments, actions.Get());
  }
  if (pid < 0) return -1;
  const bool whole = ReadToEnd(read_end.Get(), output, longest);
  if (!whole) (void)kill(pid, SIGKILL);
  const int status = WaitFor(pid);
  return whole ? status : KOVA_FAIL(KOVA_ERR_SYSTEM);
}

}  // namespace kova::host

int KLIBCExec(const char* path, const char* argument, ...) {
  va_list more;
  va_start(more, argument);
  const std::vector<std::string> arguments = kova::CollectArguments(argument, more);
  va_end(more);
  return kova::host::RunProgram(path, arguments);
}

int KLIBCExecl(const char* path, unsigned int options, const char* argument, ...) {
  (void)options;
  va_list more;
  va_start(more, argument);
  const std::vector<std::string> arguments = kova::CollectArguments(argument, more);
  va_end(more);
  return kova::host::RunProgram(path, arguments);
}
