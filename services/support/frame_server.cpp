#include "services/support/frame_server.h"

#include <malloc.h>
#include <poll.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <memory>
#include <optional>
#include <thread>
#include <unordered_map>
#include <vector>

#include "base/mutex.h"
#include "base/scope_exit.h"
#include "common/log.h"
#include "services/support/frame_connection.h"
#include "services/support/listening_socket.h"
#include "services/support/request_gate.h"

namespace ferrox::services {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr uint64_t kListenId = 0;
constexpr uint64_t kStopId = 1;
constexpr uint64_t kFirstConnectionId = 2;
constexpr size_t kLargeBytes = 8U << 20;  // a request and its reply, beyond which free memory goes back to the kernel
constexpr int kTickMs = 1000;             // between two looks for idle connections
constexpr int kFullMs = 10;               // the pause when the process has no descriptor left

}  // namespace

/// One thread accepts connections and ends those that have been idle for too long; the workers each take a connection
/// that can be read or written, do what can be done without waiting for the peer, and give it back. So a request is
/// answered by the thread that has read it, and a slow peer occupies none.
///
/// The workers share one epoll set. EPOLLONESHOT disarms a connection when it is reported to one of them, so that no
/// other gets it until Give arms it again. A connection is known by a number that is never used twice, since its
/// descriptor may be a new connection's by the time that a worker hears of the old one.
class FrameServer::Impl {
 public:
  Impl(FrameServerOptions options, Handler handler)
      : options_(std::move(options)),
        handler_(std::move(handler)),
        gate_({std::max(options_.workers / 2, 1U), options_.users.at_work, options_.users.waiting}),
        listener_(Listen(options_.socket_path, options_.socket_mode)),
        control_(epoll_create1(EPOLL_CLOEXEC)),
        ready_(epoll_create1(EPOLL_CLOEXEC)),
        stopped_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    FERROX_FAIL_IF(!control_.Valid() || !ready_.Valid() || !stopped_.Valid(), Error::kInternal,
                   "epoll: " + ErrnoText());
    Watch(control_, EPOLL_CTL_ADD, listener_.Get(), kListenId, EPOLLIN);
    Watch(control_, EPOLL_CTL_ADD, stopped_.Get(), kStopId, EPOLLIN);
    Watch(ready_, EPOLL_CTL_ADD, stopped_.Get(), kStopId, EPOLLIN);
  }
  Impl(const Impl&) = delete;
  Impl& operator=(const Impl&) = delete;
  ~Impl() { (void)unlink(options_.socket_path.c_str()); }

  void Run(int stop_fd) {
    std::vector<std::thread> threads;
    for (unsigned i = 0; i < std::max(options_.workers, 1U); ++i) threads.emplace_back([this] { Serve(); });
    if (stop_fd >= 0) Watch(control_, EPOLL_CTL_ADD, stop_fd, kStopId, EPOLLIN);
    while (!stop_) {
      epoll_event event = {};
      const int count = epoll_wait(control_.Get(), &event, 1, TimeoutMs());
      if (count == 1 && event.data.u64 == kListenId) Accept();
      if (count == 1 && event.data.u64 == kStopId) break;
      EndIdle();
    }
    Stop();
    options_.on_stop();
    for (std::thread& thread : threads) thread.join();
  }

  void Stop() {
    stop_ = true;
    const uint64_t one = 1;
    (void)!write(stopped_.Get(), &one, sizeof(one));  // never read: it stays readable and wakes every thread
  }

 private:
  using Chunk = FrameConnection::Chunk;
  using Progress = FrameConnection::Progress;
  using Connections = std::unordered_map<uint64_t, std::unique_ptr<FrameConnection>>;
  enum class Next { kReceive, kSend, kEnd, kTurn };

  static void Watch(const base::UniqueFd& epoll, int operation, int fd, uint64_t id, uint32_t events) {
    epoll_event event = {};
    event.events = events;
    event.data.u64 = id;
    (void)epoll_ctl(epoll.Get(), operation, fd, &event);
  }

  /// How long the accepting thread may sleep. Without connections nothing can time out, and it is not woken at all.
  int TimeoutMs() {
    const base::MutexLock lock(mutex_);
    return connections_.empty() ? -1 : kTickMs;
  }

  void Accept() {
    for (;;) {
      base::UniqueFd fd(accept4(listener_.Get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
      const bool full = !fd.Valid() && (errno == EMFILE || errno == ENFILE);
      if (!fd.Valid() && !full) return;
      std::unique_ptr<FrameConnection> newcomer = fd.Valid() ? NewConnection(std::move(fd)) : nullptr;
      base::MutexLock lock(mutex_);
      const bool room = newcomer != nullptr ? MakeRoom(*newcomer) : EndLongestIdle(&IsAny);
      if (newcomer != nullptr && room) Add(std::move(newcomer));
      lock.Unlock();
      // The listener stays readable: a pause keeps the loop from spinning until a descriptor is free.
      if (full && !room) return (void)poll(nullptr, 0, kFullMs);
    }
  }

  std::unique_ptr<FrameConnection> NewConnection(base::UniqueFd fd) const {
    auto connection = std::make_unique<FrameConnection>();
    connection->peer = PeerOf(fd.Get());
    connection->is_bound = options_.users.is_bound != nullptr && options_.users.is_bound(connection->peer);
    connection->is_for_many =
        connection->is_bound && options_.users.is_for_many != nullptr && options_.users.is_for_many(connection->peer);
    connection->fd = std::move(fd);
    return connection;
  }

  /// Ends another connection where there is no room for one more. False where that cannot be.
  bool MakeRoom(const FrameConnection& newcomer) BASE_REQUIRES(mutex_) {
    const auto is_own = [&newcomer](const FrameConnection& one) {
      return one.is_bound && one.peer.uid == newcomer.peer.uid;
    };
    const bool is_one_user = newcomer.is_bound && !newcomer.is_for_many;
    if (is_one_user && Count(is_own) >= options_.users.connections) return EndLongestIdle(is_own);
    if (newcomer.is_bound && Count(&IsBound) >= options_.connections_max / 2) return EndLongestIdle(&IsBound);
    if (connections_.size() < options_.connections_max) return true;
    return EndLongestIdle(newcomer.is_bound ? &IsBound : &IsAny);
  }

  void Add(std::unique_ptr<FrameConnection> connection) BASE_REQUIRES(mutex_) {
    connection->id = next_id_++;
    Watch(ready_, EPOLL_CTL_ADD, connection->fd.Get(), connection->id, EPOLLIN | EPOLLONESHOT);
    connections_[connection->id] = std::move(connection);
  }

  /// What each of the answering threads does.
  void Serve() {
    Chunk chunk;
    while (!stop_) {
      epoll_event event = {};
      if (epoll_wait(ready_.Get(), &event, 1, -1) != 1 || event.data.u64 == kStopId) continue;
      for (FrameConnection* next = Take(event.data.u64); next != nullptr; next = TakeWaiting()) {
        Give(*next, Advance(*next, chunk));
      }
    }
  }

  /// A connection for the calling thread alone; null when it has been ended.
  FrameConnection* Take(uint64_t id) {
    const base::MutexLock lock(mutex_);
    const auto it = connections_.find(id);
    if (it == connections_.end()) return nullptr;
    it->second->busy = true;
    return it->second.get();
  }

  /// The same of one whose request may run now. Every thread asks for it after its own work, which may have been what
  /// the other waits for.
  FrameConnection* TakeWaiting() {
    const base::MutexLock lock(mutex_);
    const std::optional<uint64_t> id = stop_ ? std::nullopt : gate_.Next();
    if (!id.has_value()) return nullptr;
    FrameConnection* const connection = connections_.find(*id)->second.get();
    connection->busy = true;
    return connection;
  }

  /// Of a bound user's request, whether it may run. One that has to wait is no longer the calling thread's.
  RequestGate::Admission Enter(FrameConnection& connection) {
    if (!connection.is_bound) return RequestGate::Admission::kRun;
    const base::MutexLock lock(mutex_);
    const RequestGate::Admission admission = gate_.Enter(connection.peer.uid, connection.id, connection.is_for_many);
    if (admission == RequestGate::Admission::kWait) {
      connection.state = FrameConnection::State::kWaiting;
      connection.busy = false;
    }
    return admission;
  }

  void Leave(const FrameConnection& connection) {
    if (!connection.is_bound) return;
    const base::MutexLock lock(mutex_);
    gate_.Leave(connection.peer.uid);
  }

  void Give(FrameConnection& connection, Next next) {
    if (next == Next::kTurn) return;
    const base::MutexLock lock(mutex_);
    connection.busy = false;
    if (next == Next::kEnd) {
      End(connection);
    } else {
      const uint32_t events = next == Next::kSend ? EPOLLOUT : EPOLLIN;
      Watch(ready_, EPOLL_CTL_MOD, connection.fd.Get(), connection.id, events | EPOLLONESHOT);
    }
  }

  /// Receives, answers and sends as far as it goes without waiting for the peer. The connection is the calling
  /// thread's.
  /// @return what the connection waits for next.
  Next Advance(FrameConnection& connection, Chunk& chunk) try {
    if (connection.state == FrameConnection::State::kReceiving) {
      const size_t before = connection.body.size();
      const Progress progress = connection.Receive(options_, chunk);
      const uint64_t added = connection.body.size() - before;
      if ((request_bytes_ += added) > options_.requests_limit_bytes || progress == Progress::kBroken) return Next::kEnd;
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

  void Answer(FrameConnection& connection, bool is_refused) {
    FrameReply reply = is_refused ? FrameReply(options_.users.refusal) : Handle(connection);
    const size_t worked_on = connection.body.size() + reply.body.size();
    request_bytes_ -= connection.body.size();
    connection.BeginSending(std::move(reply));
    if (worked_on > kLargeBytes) (void)malloc_trim(0);  // what it took lies scattered, and the daemon runs for months
  }

  FrameReply Handle(const FrameConnection& connection) {
    const base::ScopeExit leave([&] { Leave(connection); });
    return handler_(connection.body, connection.peer);
  }

  void End(FrameConnection& connection) BASE_REQUIRES(mutex_) {
    if (connection.state != FrameConnection::State::kSending) request_bytes_ -= connection.body.size();
    if (connection.state == FrameConnection::State::kWaiting) gate_.Forget(connection.peer.uid, connection.id);
    if (connection.descriptor.Valid()) options_.on_end(connection.descriptor.Get());
    connections_.erase(connection.id);
  }

  void EndIdle() {
    const auto now = SteadyClock::now();
    if (now < next_idle_check_) return;
    next_idle_check_ = now + std::chrono::milliseconds(kTickMs);
    const base::MutexLock lock(mutex_);
    for (auto it = connections_.begin(); it != connections_.end();) {
      FrameConnection& current = *it++->second;
      if (IsIdle(current) && now - current.last_progress > options_.idle_timeout) End(current);
    }
  }

  static bool IsAny(const FrameConnection&) { return true; }
  static bool IsBound(const FrameConnection& connection) { return connection.is_bound; }
  static bool IsIdle(const FrameConnection& connection) {
    return !connection.busy && connection.state != FrameConnection::State::kWaiting;
  }

  template <typename Which>
  unsigned Count(Which which) const BASE_REQUIRES(mutex_) {
    return static_cast<unsigned>(std::count_if(connections_.begin(), connections_.end(),
                                               [&which](const auto& entry) { return which(*entry.second); }));
  }

  /// Makes room for a new connection: of those that may go, the one without progress for the longest time goes. False
  /// when all are at work.
  template <typename MayGo>
  bool EndLongestIdle(MayGo may_go) BASE_REQUIRES(mutex_) {
    FrameConnection* longest = nullptr;
    for (const auto& [id, connection] : connections_) {
      if (!IsIdle(*connection) || !may_go(*connection)) continue;
      if (longest == nullptr || connection->last_progress < longest->last_progress) longest = connection.get();
    }
    if (longest == nullptr) return false;
    End(*longest);
    return true;
  }

  const FrameServerOptions options_;
  const Handler handler_;
  RequestGate gate_ BASE_GUARDED_BY(mutex_);
  base::UniqueFd listener_;
  base::UniqueFd control_;  ///< what the accepting thread waits for
  base::UniqueFd ready_;    ///< connections that nobody is at work on; what the answering threads wait for
  base::UniqueFd stopped_;
  std::atomic<bool> stop_{false};
  std::atomic<uint64_t> request_bytes_{0};  ///< of all requests that are not answered yet
  base::Mutex mutex_;
  Connections connections_ BASE_GUARDED_BY(mutex_);  ///< what a busy one holds is its thread's alone
  uint64_t next_id_ BASE_GUARDED_BY(mutex_) = kFirstConnectionId;
  SteadyClock::time_point next_idle_check_;  ///< of the accepting thread alone
};

FrameServer::FrameServer(FrameServerOptions options, Handler handler)
    : impl_(std::make_unique<Impl>(std::move(options), std::move(handler))) {}
FrameServer::~FrameServer() = default;
void FrameServer::Run(int stop_fd) { impl_->Run(stop_fd); }
void FrameServer::Stop() { impl_->Stop(); }

}  // namespace ferrox::services
