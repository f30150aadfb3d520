#include "services/support/frame_workers.h"

#include <malloc.h>
#include <sys/epoll.h>
#include <syslog.h>

#include <algorithm>
#include <utility>

#include "base/priority.h"
#include "base/scope_exit.h"
#include "common/log.h"

namespace ferrox::services {

namespace {

constexpr uint64_t kStoppedId = 0;
constexpr uint64_t kFirstConnectionId = 1;
constexpr size_t kLargeBytes = 8U << 20;  // a request and its reply, beyond which free memory goes back to the kernel

/// Requests at a time; bound users have half as many.
unsigned AtWorkMax(const FrameServerOptions& options, bool is_for_bound) {
  return std::max(is_for_bound ? options.workers / 2 : options.workers, 1U);
}

unsigned ConnectionsMax(const FrameServerOptions& options, bool is_for_bound) {
  return is_for_bound ? options.connections_max / 2 : options.connections_max;
}

}  // namespace

void WatchDescriptor(const base::UniqueFd& epoll, int operation, int fd, uint64_t id, uint32_t events) {
  epoll_event event = {};
  event.events = events;
  event.data.u64 = id;
  (void)epoll_ctl(epoll.Get(), operation, fd, &event);
}

FrameWorkers::FrameWorkers(Shared& shared, Whose whose)
    : shared_(shared),
      is_for_bound_(whose == Whose::kBoundUsers),
      at_work_max_(AtWorkMax(shared.options, is_for_bound_)),
      ready_(epoll_create1(EPOLL_CLOEXEC)),
      connections_(ConnectionsMax(shared.options, is_for_bound_), shared.options.users.connections),
      gate_({at_work_max_, shared.options.users.at_work, shared.options.users.waiting}),
      next_id_(kFirstConnectionId) {
  FERROX_FAIL_IF(!ready_.Valid(), Error::kInternal, "epoll: " + ErrnoText());
  WatchDescriptor(ready_, EPOLL_CTL_ADD, shared.stopped.Get(), kStoppedId, EPOLLIN);
}

/// Of bound users one more than may be at work, so that there is one to refuse.
void FrameWorkers::Start() {
  const unsigned count = at_work_max_ + (is_for_bound_ ? 1 : 0);
  for (unsigned i = 0; i < count; ++i) threads_.emplace_back([this] { Serve(); });
}

void FrameWorkers::Join() {
  for (std::thread& thread : threads_) thread.join();
  threads_.clear();
}

bool FrameWorkers::Admit(std::unique_ptr<FrameConnection> newcomer) {
  const base::MutexLock lock(mutex_);
  const ConnectionTable::Room room = connections_.RoomFor(newcomer.get());
  if (room.to_end != nullptr) End(*room.to_end);
  if (newcomer == nullptr || !room.is_there) return room.is_there;
  const int fd = newcomer->fd.Get();
  const uint64_t id = newcomer->id = next_id_++;
  connections_.Add(std::move(newcomer));
  WatchDescriptor(ready_, EPOLL_CTL_ADD, fd, id, EPOLLIN | EPOLLONESHOT);
  return true;
}

bool FrameWorkers::IsEmpty() {
  const base::MutexLock lock(mutex_);
  return connections_.IsEmpty();
}

void FrameWorkers::EndIdle(FrameConnection::SteadyClock::time_point before) {
  const base::MutexLock lock(mutex_);
  for (FrameConnection* idle : connections_.IdleSince(before)) End(*idle);
}

/// What each thread does.
void FrameWorkers::Serve() {
  if (is_for_bound_) (void)base::StandBehindOthers();
  Chunk chunk;
  while (!shared_.stop) {
    epoll_event event = {};
    if (epoll_wait(ready_.Get(), &event, 1, -1) != 1 || event.data.u64 == kStoppedId) continue;
    for (FrameConnection* next = Take(event.data.u64); next != nullptr; next = TakeWaiting()) {
      Give(*next, Advance(*next, chunk));
    }
  }
}

/// A connection for the calling thread alone; null when it has been ended.
FrameConnection* FrameWorkers::Take(uint64_t id) {
  const base::MutexLock lock(mutex_);
  FrameConnection* const connection = connections_.Find(id);
  if (connection != nullptr) connection->busy = true;
  return connection;
}

/// The same of one whose request may run now. Every thread asks for it after its own work, which may have been what
/// the other waits for.
FrameConnection* FrameWorkers::TakeWaiting() {
  if (!is_for_bound_) return nullptr;
  const base::MutexLock lock(mutex_);
  const std::optional<uint64_t> id = shared_.stop ? std::nullopt : gate_.Next();
  if (!id.has_value()) return nullptr;
  FrameConnection* const connection = connections_.Find(*id);
  connection->busy = true;
  return connection;
}

void FrameWorkers::Give(FrameConnection& connection, Next next) {
  if (next == Next::kTurn) return;
  const base::MutexLock lock(mutex_);
  connection.busy = false;
  if (next == Next::kEnd) {
    End(connection);
  } else {
    const uint32_t events = next == Next::kSend ? EPOLLOUT : EPOLLIN;
    WatchDescriptor(ready_, EPOLL_CTL_MOD, connection.fd.Get(), connection.id, events | EPOLLONESHOT);
  }
}

/// Receives, answers and sends as far as it goes without waiting for the peer. The connection is the calling thread's.
/// @return what the connection waits for next.
FrameWorkers::Next FrameWorkers::Advance(FrameConnection& connection, Chunk& chunk) try {
  if (connection.state == FrameConnection::State::kReceiving) {
    const size_t before = connection.body.size();
    const Progress progress = connection.Receive(shared_.options, chunk);
    const uint64_t unanswered = shared_.request_bytes += connection.body.size() - before;
    if (unanswered > shared_.options.requests_limit_bytes || progress == Progress::kBroken) return Next::kEnd;
    if (progress == Progress::kMore) return Next::kReceive;
    const RequestGate::Admission admission = Enter(connection);
    if (admission == RequestGate::Admission::kWait) return Next::kTurn;
    Answer(connection, admission == RequestGate::Admission::kRefused);
  } else if (connection.state == FrameConnection::State::kWaiting) {
    Answer(connection, false);
  }
  const Progress progress = connection.Send();
  if (progress == Progress::kBroken) return Next::kEnd;
  if (progress == Progress::kMore) return Next::kSend;
  connection.BeginReceiving();
  return Next::kReceive;
} catch (const std::exception& error) {
  Log(LOG_ERR, "frame_server: request of uid %u failed: %s", connection.peer.uid, error.what());
  return Next::kEnd;
}

/// Whether a request may run. One that has to wait is no longer the calling thread's.
RequestGate::Admission FrameWorkers::Enter(FrameConnection& connection) {
  if (!is_for_bound_) return RequestGate::Admission::kRun;
  const base::MutexLock lock(mutex_);
  const RequestGate::Admission admission = gate_.Enter(connection.peer.uid, connection.id, connection.is_for_many);
  if (admission == RequestGate::Admission::kWait) {
    connection.state = FrameConnection::State::kWaiting;
    connection.busy = false;
  }
  return admission;
}

void FrameWorkers::Answer(FrameConnection& connection, bool is_refused) {
  FrameReply reply = is_refused ? FrameReply(shared_.options.users.refusal) : Handle(connection);
  const size_t worked_on = connection.body.size() + reply.body.size();
  shared_.request_bytes -= connection.body.size();
  connection.BeginSending(std::move(reply));
  if (worked_on > kLargeBytes) (void)malloc_trim(0);  // what it took lies scattered, and the daemon runs for months
}

FrameReply FrameWorkers::Handle(const FrameConnection& connection) {
  const base::ScopeExit leave([&] { Leave(connection); });
  return shared_.handler(connection.body, connection.peer);
}

void FrameWorkers::Leave(const FrameConnection& connection) {
  if (!is_for_bound_) return;
  const base::MutexLock lock(mutex_);
  gate_.Leave(connection.peer.uid);
}

void FrameWorkers::End(FrameConnection& connection) {
  if (connection.state != FrameConnection::State::kSending) shared_.request_bytes -= connection.body.size();
  if (connection.state == FrameConnection::State::kWaiting) gate_.Forget(connection.peer.uid, connection.id);
  if (connection.descriptor.Valid()) shared_.options.on_end(connection.descriptor.Get());
  connections_.Remove(connection.id);
}

}  // namespace ferrox::services
