#include "services/kovacontentextractd/worker_process.h"

#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/wait.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <optional>

#include "base/descriptor_passing.h"
#include "common/error.h"
#include "common/json_util.h"
#include "common/log.h"
#include "services/kovacontentextractd/region.h"
#include "services/kovacontentextractd/worker_protocol.h"
#include "services/kovacontentextractd/worker_template.h"

namespace ferrox::extract {

namespace {

using SteadyClock = std::chrono::steady_clock;
using std::chrono::milliseconds;

constexpr milliseconds kStartMax(10000);
/// For a process that has closed its socket to be gone.
constexpr milliseconds kReapMax(2000);

/// Rounded up, so that poll does not return just before the time; 0 when it has come.
int MillisecondsUntil(SteadyClock::time_point end) {
  const auto left = std::chrono::ceil<milliseconds>(end - SteadyClock::now());
  return static_cast<int>(std::max<int64_t>(left.count(), 0));
}

}  // namespace

/// The greeting comes once the sandbox is closed, and says what of it this kernel lacks.
WorkerProcess::WorkerProcess(WorkerTemplate& prepared) : region_(MakeRegion()) {
  FERROX_FAIL_IF(!region_.Valid(), Error::kInternal, "no memory to share: " + ErrnoText());
  int ends[2];
  FERROX_FAIL_IF(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) != 0, Error::kInternal,
                 "socketpair: " + ErrnoText());
  socket_ = base::UniqueFd(ends[0]);
  {
    const base::UniqueFd theirs(ends[1]);  // gone before the greeting is waited for, so that its end is noticed
    process_.Take(prepared.Fork(theirs.Get(), region_.Get()));
  }
  RawAnswer greeting;
  Json::Value json;
  const bool started = Receive(SteadyClock::now() + kStartMax, greeting) == Outcome::kAnswered &&
                       fromString(json, greeting.json) && json["missing"].isArray();
  FERROX_FAIL_IF(!started, Error::kInternal, prepared.Program() + " ended before it was ready");
  missing_ = json["missing"];
}

/// A worker that waits for a file has nothing to say: whatever can be read says that it has ended, or is not to be
/// trusted.
bool WorkerProcess::IsReady() const {
  pollfd state = {socket_.Get(), POLLIN, 0};
  return poll(&state, 1, 0) == 0;  // the end is readable, and so is what nobody asked for
}

WorkerProcess::Outcome WorkerProcess::Ask(const Task& task, milliseconds longest, RawAnswer& answer) {
  if (!Send(task)) return Outcome::kNotAsked;
  const Outcome outcome = Receive(SteadyClock::now() + longest, answer);
  if (outcome == Outcome::kCrashed) return HowItEnded();
  return outcome == Outcome::kAnswered || process_.End() ? outcome : Outcome::kHeld;
}

/// Fits into the socket's buffer, so that a worker that takes nothing cannot hold us.
bool WorkerProcess::Send(const Task& task) {
  const RequestHeader header = {static_cast<uint16_t>(task.reader.size()), static_cast<uint16_t>(task.extension.size()),
                                static_cast<uint16_t>(task.name.size()), static_cast<uint16_t>(task.depth),
                                ++requests_};
  std::string bytes(reinterpret_cast<const char*>(&header), sizeof(header));
  bytes += task.reader + task.extension + task.name;
  return base::SendWithDescriptors(socket_.Get(), bytes, {task.fd});
}

/// An answer to the last request, or the greeting to request 0: a head, then its JSON text.
WorkerProcess::Outcome WorkerProcess::Receive(TimePoint end, RawAnswer& answer) {
  AnswerHeader header;
  std::array<char, 4096> buffer;  // most answers are shorter
  size_t have = 0;
  while (have < sizeof(header)) {
    const Outcome outcome = ReceiveSome(buffer.data(), buffer.size(), end, have);
    if (outcome != Outcome::kAnswered) return outcome;
  }
  memcpy(&header, buffer.data(), sizeof(header));
  // An earlier file may still speak, but not where there was none: nobody waits for ever for one that lies about it.
  if (header.number != requests_) return requests_ <= 1 ? Outcome::kNonsense : Outcome::kNotAsked;
  if (header.json_bytes > kAnswerMaxBytes) return Outcome::kNonsense;
  answer.text_bytes = header.text_bytes;
  answer.json.assign(buffer.data() + sizeof(header), std::min<size_t>(have - sizeof(header), header.json_bytes));
  have = answer.json.size();
  answer.json.resize(header.json_bytes);
  while (have < answer.json.size()) {
    const Outcome outcome = ReceiveSome(answer.json.data(), answer.json.size(), end, have);
    if (outcome != Outcome::kAnswered) return outcome;
  }
  return Outcome::kAnswered;
}

/// Waits for bytes and puts them behind the `have` that `to` has already, which rises.
WorkerProcess::Outcome WorkerProcess::ReceiveSome(char* to, size_t room, TimePoint end, size_t& have) {
  for (;;) {
    pollfd state = {socket_.Get(), POLLIN, 0};
    const int ready = poll(&state, 1, MillisecondsUntil(end));
    if (ready == 0) return Outcome::kTookTooLong;
    const ssize_t got = ready < 0 ? -1 : recv(socket_.Get(), to + have, room - have, MSG_DONTWAIT);
    if (got < 0 && (errno == EINTR || errno == EAGAIN)) continue;
    if (got <= 0) return Outcome::kCrashed;
    have += static_cast<size_t>(got);
    return Outcome::kAnswered;
  }
}

/// What the end of a process says about the file that it was reading.
WorkerProcess::Outcome WorkerProcess::HowItEnded() {
  const std::optional<int> status = process_.Wait(kReapMax);
  if (!process_.End()) return Outcome::kHeld;
  if (!status) return Outcome::kCrashed;
  if (WIFEXITED(*status)) return WEXITSTATUS(*status) == kExitNoMemory ? Outcome::kNoMemory : Outcome::kCrashed;
  const int signal_number = WTERMSIG(*status);
  if (signal_number == SIGPROF || signal_number == SIGXCPU) return Outcome::kTookTooLong;
  // Nobody but the kernel, when it runs out of memory, kills a worker from outside.
  return signal_number == SIGKILL ? Outcome::kNoMemory : Outcome::kCrashed;
}

}  // namespace ferrox::extract
