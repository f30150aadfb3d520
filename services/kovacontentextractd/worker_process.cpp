#include "services/kovacontentextractd/worker_process.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <iterator>

#include "common/error.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/scope_exit.h"
#include "services/kovacontentextractd/worker_protocol.h"

namespace ferrox::extract {

namespace {

using SteadyClock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr milliseconds kStartMax(10000);
/// For a process that has closed its socket, or was killed, to be gone.
constexpr milliseconds kEndMax(2000);
constexpr int kEndPollMs = 1;
constexpr int kNoStatus = -1;

int MillisecondsUntil(SteadyClock::time_point end) {
  const auto left = std::chrono::ceil<milliseconds>(end - SteadyClock::now());
  return static_cast<int>(std::max<int64_t>(left.count(), 0));
}

/// Starts the program with `socket` as its descriptor and nothing else of ours. @return 0 or an errno.
int Spawn(const std::string& program, const std::string& empty_folder, int socket, pid_t& pid) {
  posix_spawn_file_actions_t actions;
  posix_spawnattr_t attributes;
  (void)posix_spawn_file_actions_init(&actions);
  (void)posix_spawnattr_init(&attributes);
  const ScopeExit free_both([&] {
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

WorkerProcess::WorkerProcess(const std::string& program, const std::string& empty_folder) {
  Start(program, empty_folder);
  std::string greeting;
  Json::Value json;
  const Outcome outcome = Receive(SteadyClock::now() + kStartMax, greeting);
  const bool started = outcome == Outcome::kAnswered && fromString(json, greeting) && json["missing"].isArray();
  if (!started) (void)HowItEnded();
  FERROX_FAIL_IF(!started, Error::kInternal, program + " ended at its start; is it installed whole?");
  missing_ = json["missing"];
}

WorkerProcess::~WorkerProcess() { End(); }

void WorkerProcess::End() {
  if (pid_ <= 0) return;
  (void)kill(pid_, SIGKILL);
  (void)Reap(kEndMax);
}

void WorkerProcess::Start(const std::string& program, const std::string& empty_folder) {
  int ends[2];
  FERROX_FAIL_IF(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0, Error::kInternal,
                 "socketpair: " + ErrnoText());
  socket_ = UniqueFd(ends[0]);
  // A descriptor that had its number already would keep its close-on-exec flag.
  const UniqueFd theirs(fcntl(ends[1], F_DUPFD_CLOEXEC, kWorkerSocket + 1));
  (void)close(ends[1]);
  const int error = Spawn(program, empty_folder, theirs.Get(), pid_);
  if (error != 0) pid_ = -1;
  FERROX_FAIL_IF(error != 0, Error::kInternal, "cannot run " + program + ": " + strerror(error));
}

bool WorkerProcess::IsReady() const {
  pollfd state = {socket_.Get(), POLLIN, 0};
  return poll(&state, 1, 0) == 0;  // the end is readable, and so is what nobody asked for
}

WorkerProcess::Outcome WorkerProcess::Ask(const Task& task, milliseconds longest, std::string& answer) {
  if (!Send(task)) return Outcome::kNotAsked;
  const Outcome outcome = Receive(SteadyClock::now() + longest, answer);
  if (outcome == Outcome::kCrashed) return HowItEnded();
  if (outcome != Outcome::kAnswered) End();
  return outcome;
}

/// Fits into the socket's buffer, so that a worker that takes nothing cannot hold us.
bool WorkerProcess::Send(const Task& task) {
  RequestHeader header = {static_cast<uint16_t>(task.reader.size()), static_cast<uint16_t>(task.extension.size()),
                          static_cast<uint16_t>(task.name.size()), 0, ++requests_};
  std::string bytes(reinterpret_cast<const char*>(&header), sizeof(header));
  bytes += task.reader + task.extension + task.name;
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))] = {};
  iovec part = {bytes.data(), bytes.size()};
  msghdr message = {};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control;
  message.msg_controllen = sizeof(control);
  cmsghdr* ancillary = CMSG_FIRSTHDR(&message);
  ancillary->cmsg_level = SOL_SOCKET;
  ancillary->cmsg_type = SCM_RIGHTS;
  ancillary->cmsg_len = CMSG_LEN(sizeof(int));
  memcpy(CMSG_DATA(ancillary), &task.fd, sizeof(int));
  ssize_t sent;
  do {
    sent = sendmsg(socket_.Get(), &message, MSG_NOSIGNAL | MSG_DONTWAIT);
  } while (sent < 0 && errno == EINTR);
  return sent == static_cast<ssize_t>(bytes.size());
}

WorkerProcess::Outcome WorkerProcess::Receive(TimePoint end, std::string& answer) {
  AnswerHeader header;
  std::string bytes;
  const Outcome outcome = ReadExactly(sizeof(header), end, bytes);
  if (outcome != Outcome::kAnswered) return outcome;
  memcpy(&header, bytes.data(), sizeof(header));
  if (header.number != requests_) return Outcome::kNotAsked;  // an earlier file still speaks
  if (header.bytes > kAnswerMaxBytes) return Outcome::kNonsense;
  answer.clear();
  answer.reserve(header.bytes);
  return ReadExactly(header.bytes, end, answer);
}

WorkerProcess::Outcome WorkerProcess::ReadExactly(size_t bytes, TimePoint end, std::string& to) {
  std::array<char, 65536> chunk;
  while (to.size() < bytes) {
    pollfd state = {socket_.Get(), POLLIN, 0};
    const int ready = poll(&state, 1, MillisecondsUntil(end));
    if (ready == 0) return Outcome::kTookTooLong;
    const size_t wanted = std::min(bytes - to.size(), chunk.size());
    const ssize_t got = ready < 0 ? -1 : recv(socket_.Get(), chunk.data(), wanted, MSG_DONTWAIT);
    if (got < 0 && (errno == EINTR || errno == EAGAIN)) continue;
    if (got <= 0) return Outcome::kCrashed;
    to.append(chunk.data(), static_cast<size_t>(got));
  }
  return Outcome::kAnswered;
}

/// What the end of a process says about the file that it was reading.
WorkerProcess::Outcome WorkerProcess::HowItEnded() {
  const int status = Reap(kEndMax);
  if (status == kNoStatus) {
    End();
    return Outcome::kCrashed;
  }
  if (WIFEXITED(status)) return WEXITSTATUS(status) == kExitNoMemory ? Outcome::kNoMemory : Outcome::kCrashed;
  const int signal_number = WTERMSIG(status);
  if (signal_number == SIGPROF || signal_number == SIGXCPU) return Outcome::kTookTooLong;
  // Nobody but the kernel, when it runs out of memory, kills a worker from outside.
  return signal_number == SIGKILL ? Outcome::kNoMemory : Outcome::kCrashed;
}

/// The status with which it ended, at most `longest` from now; kNoStatus when it has not. One that a file system holds
/// in the middle of a read cannot even be killed: it is left alone then.
int WorkerProcess::Reap(milliseconds longest) {
  const UniqueFd process(static_cast<int>(syscall(SYS_pidfd_open, pid_, 0)));
  pollfd state = {process.Get(), POLLIN, 0};
  const auto end = SteadyClock::now() + longest;
  for (;;) {
    int status = 0;
    const pid_t ended = waitpid(pid_, &status, WNOHANG);
    if (ended == pid_ || (ended < 0 && errno != EINTR)) {
      pid_ = -1;
      return ended < 0 ? kNoStatus : status;
    }
    if (SteadyClock::now() > end) return kNoStatus;
    if (poll(&state, 1, process.Valid() ? MillisecondsUntil(end) : kEndPollMs) < 0 && errno != EINTR) return kNoStatus;
  }
}

}  // namespace ferrox::extract
