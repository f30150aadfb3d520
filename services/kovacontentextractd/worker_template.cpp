#include "services/kovacontentextractd/worker_template.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <string_view>

#include "base/descriptor_passing.h"
#include "base/scope_exit.h"
#include "common/error.h"
#include "common/log.h"
#include "services/kovacontentextractd/worker_protocol.h"

namespace ferrox::extract {

namespace {

/// How long a program may take to load; on a machine that swaps, seconds.
constexpr int kStartMaxMs = 10000;

/// Starts the program with `socket` as its descriptor and nothing else of ours. @return 0 or an errno.
int Spawn(const std::string& program, const std::string& empty_folder, int socket, pid_t& pid) {
  posix_spawn_file_actions_t actions;
  posix_spawnattr_t attributes;
  (void)posix_spawn_file_actions_init(&actions);
  (void)posix_spawnattr_init(&attributes);
  const base::ScopeExit free_both([&] {
    (void)posix_spawn_file_actions_destroy(&actions);
    (void)posix_spawnattr_destroy(&attributes);
  });
  for (const int usual : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
    (void)posix_spawn_file_actions_addopen(&actions, usual, "/dev/null", O_RDWR, 0);
  }
  (void)posix_spawn_file_actions_adddup2(&actions, socket, kWorkerSocket);
  sigset_t none, all;
  (void)sigemptyset(&none);
  (void)sigfillset(&all);
  (void)posix_spawnattr_setsigmask(&attributes, &none);
  (void)posix_spawnattr_setsigdefault(&attributes, &all);
  (void)posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
  const std::array<char*, 3> arguments = {const_cast<char*>(program.c_str()), const_cast<char*>(empty_folder.c_str()),
                                          nullptr};
  // Without the environment: it tells a library where to look for more code.
  const std::array<char*, 1> environment = {nullptr};
  return posix_spawn(&pid, program.c_str(), &actions, &attributes, arguments.data(), environment.data());
}

}  // namespace

WorkerTemplate::WorkerTemplate(const std::string& program, const std::string& empty_folder) : program_(program) {
  int ends[2];
  FERROX_FAIL_IF(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0, Error::kInternal,
                 "socketpair: " + ErrnoText());
  socket_ = base::UniqueFd(ends[0]);
  // A descriptor that had its number already would keep its close-on-exec flag.
  const base::UniqueFd theirs(fcntl(ends[1], F_DUPFD_CLOEXEC, kWorkerSocket + 1));
  (void)close(ends[1]);
  pid_t pid = -1;
  const int error = theirs.Valid() ? Spawn(program, empty_folder, theirs.Get(), pid) : errno;
  FERROX_FAIL_IF(error != 0, Error::kInternal, "cannot run " + program + ": " + strerror(error));
  process_.Take(pid);
}

bool WorkerTemplate::IsReady() const {
  pollfd state = {socket_.Get(), POLLIN, 0};
  return poll(&state, 1, 0) == 0;  // its end is readable
}

/// The first one waits for the program to be loaded. The template answers with a process number that is a child of this
/// process, since it forks with CLONE_PARENT.
pid_t WorkerTemplate::Fork(int socket, int region) {
  const bool asked = base::SendWithDescriptors(socket_.Get(), std::string_view(&kForkRequest, 1), {socket, region});
  pollfd state = {socket_.Get(), POLLIN, 0};
  int ready;
  do {
    ready = asked ? poll(&state, 1, kStartMaxMs) : 0;
  } while (ready < 0 && errno == EINTR);
  ForkAnswer answer = {};
  const bool told = ready > 0 && recv(socket_.Get(), &answer, sizeof(answer), 0) == sizeof(answer);
  FERROX_FAIL_IF(!told, Error::kInternal, program_ + " ended at its start; is it installed whole?");
  FERROX_FAIL_IF(answer.pid <= 0, Error::kInternal, "cannot fork " + program_ + ": " + strerror(-answer.pid));
  return answer.pid;
}

}  // namespace ferrox::extract
