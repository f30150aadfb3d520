#include "services/support/frame_server.h"

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <condition_variable>
#include <cstring>
#include <deque>
#include <mutex>
#include <optional>
#include <thread>
#include <unordered_map>
#include <vector>

#include "common/log.h"

namespace ferrox::services {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr size_t kHeaderBytes = 4;
constexpr size_t kReadChunkBytes = 64 * 1024;
constexpr uint64_t kListenId = 0;
constexpr uint64_t kStopId = 1;
constexpr uint64_t kWakeId = 2;
constexpr uint64_t kFirstConnectionId = 3;
constexpr int kTickMs = 1000;

sockaddr_un AddressOf(const std::string& path) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  FERROX_FAIL_IF(path.size() >= sizeof(address.sun_path), Error::kInternal,
                 "socket path " + path + " is too long; choose a shorter root");
  memcpy(address.sun_path, path.c_str(), path.size() + 1);
  return address;
}

/// A socket file that nobody serves is left over from a dead process.
void RemoveStaleSocket(const std::string& path, const sockaddr_un& address) {
  const UniqueFd probe(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const bool served =
      connect(probe.Get(), reinterpret_cast<const sockaddr*>(&address), static_cast<socklen_t>(sizeof(address))) == 0;
  FERROX_FAIL_IF(served, Error::kInternal, path + " is served by another process; stop it first");
  struct stat status = {};
  if (lstat(path.c_str(), &status) == 0 && S_ISSOCK(status.st_mode)) (void)unlink(path.c_str());
}

UniqueFd Listen(const std::string& path, mode_t mode) {
  const sockaddr_un address = AddressOf(path);
  RemoveStaleSocket(path, address);
  UniqueFd listener(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  FERROX_FAIL_IF(!listener.Valid(), Error::kInternal, "socket: " + ErrnoText());
  (void)fchmod(listener.Get(), mode);  // what bind gives the file; chmod makes it certain whatever the umask
  const bool listening =
      bind(listener.Get(), reinterpret_cast<const sockaddr*>(&address), static_cast<socklen_t>(sizeof(address))) == 0 &&
      chmod(path.c_str(), mode) == 0 && listen(listener.Get(), SOMAXCONN) == 0;
  FERROX_FAIL_IF(!listening, Error::kInternal, "cannot serve " + path + ": " + ErrnoText());
  return listener;
}

Peer PeerOf(int fd) {
  ucred credentials = {};
  socklen_t size = sizeof(credentials);
  if (getsockopt(fd, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) return {static_cast<uid_t>(-1), 0, 0};
  return {credentials.uid, credentials.gid, credentials.pid};
}

std::string Framed(const std::string& body) {
  const auto length = static_cast<uint32_t>(body.size());
  std::string frame;
  frame.reserve(kHeaderBytes + body.size());
  frame.append(reinterpret_cast<const char*>(&length), kHeaderBytes);
  frame += body;
  return frame;
}

enum class Progress { kMore, kComplete, kBroken };

/// One client: receives a request, waits for its reply, sends it, and so on.
struct Connection {
  enum class State { kReceiving, kAnswering, kSending };

  UniqueFd fd;
  Peer peer;
  State state = State::kReceiving;
  std::string buffer;  ///< the frame received or sent so far, header included
  size_t sent = 0;
  uint64_t request_bytes = 0;  ///< what the request takes from the server's limit until it is answered
  SteadyClock::time_point last_progress = SteadyClock::now();

  /// The length of the whole frame, once its header is there.
  std::optional<uint64_t> FrameBytes() const {
    if (buffer.size() < kHeaderBytes) return std::nullopt;
    uint32_t length = 0;
    memcpy(&length, buffer.data(), kHeaderBytes);
    return kHeaderBytes + static_cast<uint64_t>(length);
  }

  /// Reads what is there, up to the end of the frame. Memory grows with what arrives, not with what is announced.
  Progress Receive(uint32_t limit_bytes, std::array<char, kReadChunkBytes>& chunk) {
    for (;;) {
      const auto frame_bytes = FrameBytes();
      if (frame_bytes && *frame_bytes > kHeaderBytes + static_cast<uint64_t>(limit_bytes)) return Progress::kBroken;
      const uint64_t missing = frame_bytes.value_or(kHeaderBytes) - buffer.size();
      if (missing == 0) return Progress::kComplete;
      const ssize_t got = read(fd.Get(), chunk.data(), std::min<uint64_t>(missing, chunk.size()));
      if (got < 0 && errno == EINTR) continue;
      if (got < 0 && errno == EAGAIN) return Progress::kMore;
      if (got <= 0) return Progress::kBroken;
      buffer.append(chunk.data(), static_cast<size_t>(got));
      last_progress = SteadyClock::now();
    }
  }

  Progress Send() {
    while (sent < buffer.size()) {
      const ssize_t put = send(fd.Get(), buffer.data() + sent, buffer.size() - sent, MSG_NOSIGNAL);
      if (put < 0 && errno == EINTR) continue;
      if (put < 0 && errno == EAGAIN) return Progress::kMore;
      if (put < 0) return Progress::kBroken;
      sent += static_cast<size_t>(put);
      last_progress = SteadyClock::now();
    }
    return Progress::kComplete;
  }
};

/// A few threads that answer requests, and the replies that they have ready.
class Workers {
 public:
  struct Reply {
    uint64_t id;
    std::optional<std::string> body;  ///< none: the handler failed
  };

  Workers(unsigned count, const FrameServer::Handler& handler, int wake_fd) : handler_(handler), wake_fd_(wake_fd) {
    for (unsigned i = 0; i < std::max(count, 1U); ++i) threads_.emplace_back([this] { Work(); });
  }

  ~Workers() { Finish(); }

  /// Waits for the requests being answered; those not begun are dropped.
  void Finish() {
    {
      const std::lock_guard guard(mutex_);
      stopping_ = true;
    }
    changed_.notify_all();
    for (std::thread& thread : threads_) thread.join();
    threads_.clear();
  }

  void Ask(uint64_t id, std::string request, const Peer& peer) {
    {
      const std::lock_guard guard(mutex_);
      requests_.push_back({id, std::move(request), peer});
    }
    changed_.notify_one();
  }

  std::vector<Reply> TakeReplies() {
    const std::lock_guard guard(mutex_);
    return std::exchange(replies_, {});
  }

 private:
  struct Request {
    uint64_t id;
    std::string body;
    Peer peer;
  };

  void Work() {
    std::unique_lock lock(mutex_);
    for (;;) {
      changed_.wait(lock, [this] { return stopping_ || !requests_.empty(); });
      if (stopping_) return;
      const Request request = std::move(requests_.front());
      requests_.pop_front();
      lock.unlock();
      Reply reply{request.id, Answer(request)};
      lock.lock();
      replies_.push_back(std::move(reply));
      const uint64_t one = 1;
      (void)!write(wake_fd_, &one, sizeof(one));
    }
  }

  std::optional<std::string> Answer(const Request& request) {
    try {
      return handler_(request.body, request.peer);
    } catch (const std::exception& error) {
      Log(LOG_ERR, "frame_server: request of uid %u failed: %s", request.peer.uid, error.what());
      return std::nullopt;
    }
  }

  const FrameServer::Handler& handler_;
  int wake_fd_;
  std::mutex mutex_;
  std::condition_variable changed_;
  bool stopping_ = false;
  std::deque<Request> requests_;
  std::vector<Reply> replies_;
  std::vector<std::thread> threads_;
};

}  // namespace

class FrameServer::Impl {
 public:
  Impl(FrameServerOptions options, Handler handler)
      : options_(std::move(options)),
        handler_(std::move(handler)),
        listener_(Listen(options_.socket_path, options_.socket_mode)),
        epoll_(epoll_create1(EPOLL_CLOEXEC)),
        wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
    FERROX_FAIL_IF(!epoll_.Valid() || !wake_.Valid(), Error::kInternal, "epoll: " + ErrnoText());
    Watch(listener_.Get(), kListenId, EPOLLIN);
    Watch(wake_.Get(), kWakeId, EPOLLIN);
  }
  Impl(const Impl&) = delete;
  Impl& operator=(const Impl&) = delete;
  ~Impl() { (void)unlink(options_.socket_path.c_str()); }

  void Run(int stop_fd) {
    Workers workers(options_.workers, handler_, wake_.Get());
    if (stop_fd >= 0) Watch(stop_fd, kStopId, EPOLLIN);
    std::array<epoll_event, 64> events;
    while (!stop_) {
      const int count = epoll_wait(epoll_.Get(), events.data(), static_cast<int>(events.size()), TimeoutMs());
      for (int i = 0; i < count; ++i) OnEvent(events[static_cast<size_t>(i)].data.u64, workers);
      SendReplies(workers);
      EndIdle();
    }
    options_.on_stop();
    workers.Finish();
    SendReplies(workers);
  }

  void Stop() {
    stop_ = true;
    const uint64_t one = 1;
    (void)!write(wake_.Get(), &one, sizeof(one));
  }

 private:
  using Connections = std::unordered_map<uint64_t, Connection>;

  void Watch(int fd, uint64_t id, uint32_t events) {
    epoll_event event = {};
    event.events = events;
    event.data.u64 = id;
    (void)epoll_ctl(epoll_.Get(), EPOLL_CTL_ADD, fd, &event);
  }

  void Rewatch(Connection& connection, uint64_t id, uint32_t events) {
    epoll_event event = {};
    event.events = events;
    event.data.u64 = id;
    (void)epoll_ctl(epoll_.Get(), EPOLL_CTL_MOD, connection.fd.Get(), &event);
  }

  /// Without connections nothing can time out, and an idle daemon sleeps.
  int TimeoutMs() const { return connections_.empty() ? -1 : kTickMs; }

  void OnEvent(uint64_t id, Workers& workers) {
    if (id == kListenId) {
      Accept();
    } else if (id == kStopId) {
      stop_ = true;
    } else if (id == kWakeId) {
      uint64_t count = 0;
      (void)!read(wake_.Get(), &count, sizeof(count));
    } else if (const auto it = connections_.find(id); it != connections_.end()) {
      OnConnection(it, workers);
    }
  }

  void Accept() {
    for (;;) {
      UniqueFd fd(accept4(listener_.Get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
      if (!fd.Valid() && (errno == EMFILE || errno == ENFILE) && EndLongestIdle()) continue;
      if (!fd.Valid()) return;
      if (connections_.size() >= options_.connections_max && !EndLongestIdle()) continue;
      const uint64_t id = next_id_++;
      Connection& connection = connections_[id];
      connection.peer = PeerOf(fd.Get());
      connection.fd = std::move(fd);
      Watch(connection.fd.Get(), id, EPOLLIN);
    }
  }

  void OnConnection(Connections::iterator it, Workers& workers) {
    Connection& connection = it->second;
    if (connection.state == Connection::State::kReceiving) {
      const size_t before = connection.buffer.size();
      const Progress progress = connection.Receive(options_.request_limit_bytes, chunk_);
      connection.request_bytes += connection.buffer.size() - before;
      request_bytes_ += connection.buffer.size() - before;
      if (progress == Progress::kBroken || request_bytes_ > options_.requests_limit_bytes) return End(it);
      if (progress == Progress::kComplete) StartAnswer(it, workers);
    } else if (connection.state == Connection::State::kSending) {
      ContinueSending(it);
    } else {
      // Being answered and the peer has gone or hung up: nothing to wait for but the handler.
      Rewatch(connection, it->first, EPOLLET);
    }
  }

  void StartAnswer(Connections::iterator it, Workers& workers) {
    Connection& connection = it->second;
    connection.state = Connection::State::kAnswering;
    Rewatch(connection, it->first, EPOLLET);
    connection.buffer.erase(0, kHeaderBytes);
    workers.Ask(it->first, std::move(connection.buffer), connection.peer);
  }

  void SendReplies(Workers& workers) {
    for (Workers::Reply& reply : workers.TakeReplies()) {
      const auto it = connections_.find(reply.id);
      if (it == connections_.end()) continue;
      if (!reply.body) {
        End(it);
        continue;
      }
      request_bytes_ -= std::exchange(it->second.request_bytes, 0);
      it->second.state = Connection::State::kSending;
      it->second.buffer = Framed(*reply.body);
      it->second.sent = 0;
      it->second.last_progress = SteadyClock::now();
      Rewatch(it->second, it->first, EPOLLOUT);
      ContinueSending(it);
    }
  }

  void ContinueSending(Connections::iterator it) {
    Connection& connection = it->second;
    const Progress progress = connection.Send();
    if (progress == Progress::kBroken) return End(it);
    if (progress == Progress::kMore) return;
    connection.state = Connection::State::kReceiving;
    std::string().swap(connection.buffer);
    Rewatch(connection, it->first, EPOLLIN);
  }

  void End(Connections::iterator it) {
    request_bytes_ -= it->second.request_bytes;
    connections_.erase(it);
  }

  void EndIdle() {
    const auto now = SteadyClock::now();
    if (now < next_idle_check_) return;
    next_idle_check_ = now + std::chrono::milliseconds(kTickMs);
    for (auto it = connections_.begin(); it != connections_.end();) {
      const auto current = it++;
      const bool waits_for_peer = current->second.state != Connection::State::kAnswering;
      if (waits_for_peer && now - current->second.last_progress > options_.idle_timeout) End(current);
    }
  }

  /// Makes room for a newcomer: the connection that has kept us waiting longest goes. False when all are at work.
  bool EndLongestIdle() {
    auto longest = connections_.end();
    for (auto it = connections_.begin(); it != connections_.end(); ++it) {
      if (it->second.state == Connection::State::kAnswering) continue;
      if (longest == connections_.end() || it->second.last_progress < longest->second.last_progress) longest = it;
    }
    if (longest == connections_.end()) return false;
    End(longest);
    return true;
  }

  const FrameServerOptions options_;
  const Handler handler_;
  UniqueFd listener_;
  UniqueFd epoll_;
  UniqueFd wake_;
  std::atomic<bool> stop_{false};
  Connections connections_;
  uint64_t next_id_ = kFirstConnectionId;
  uint64_t request_bytes_ = 0;
  SteadyClock::time_point next_idle_check_;
  std::array<char, kReadChunkBytes> chunk_;
};

FrameServer::FrameServer(FrameServerOptions options, Handler handler)
    : impl_(std::make_unique<Impl>(std::move(options), std::move(handler))) {}
FrameServer::~FrameServer() = default;
void FrameServer::Run(int stop_fd) { impl_->Run(stop_fd); }
void FrameServer::Stop() { impl_->Stop(); }

}  // namespace ferrox::services
