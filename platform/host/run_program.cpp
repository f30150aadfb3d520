#include "platform/host/run_program.h"

#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>

#include <kova/service.h>

#include "platform/base/arguments.h"
#include "platform/base/failure.h"

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

}  // namespace

std::vector<char*> ArgumentVector(const std::vector<std::string>& texts) {
  std::vector<char*> pointers;
  pointers.reserve(texts.size() + 1);
  for (const std::string& text : texts) pointers.push_back(const_cast<char*>(text.c_str()));
  pointers.push_back(nullptr);
  return pointers;
}

int RunProgram(const std::string& path, const std::vector<std::string>& arguments) {
  std::vector<std::string> texts = {path};
  texts.insert(texts.end(), arguments.begin(), arguments.end());
  const std::vector<char*> argv = ArgumentVector(texts);
  const PlainSignals signals;
  pid_t pid = -1;
  const int error = posix_spawn(&pid, path.c_str(), nullptr, signals.Get(), argv.data(), environ);
  if (error != 0) {
    errno = error;
    return KOVA_FAIL_ERRNO();
  }
  int status = 0;
  while (waitpid(pid, &status, 0) < 0) {
    if (errno != EINTR) return KOVA_FAIL_ERRNO();
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : KOVA_FAIL(KOVA_ERR_SYSTEM);
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
