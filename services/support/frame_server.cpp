#include "services/support/frame_server.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <utility>

#include "common/log.h"
#include "services/support/frame_workers.h"
#include "services/support/listening_socket.h"
#include "services/support/reception.h"

namespace ferrox::services {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr uint64_t kListenId = 0;
constexpr uint64_t kStopId = 1;
constexpr int kTickMs = 1000;  // between two looks for idle connections
constexpr int kFullMs = 10;    // the pause when the process has no descriptor left
constexpr int kCrowdMs = 1;    // the pause behind connections of bound users, so that many come together

}  // namespace

/// One thread accepts connections and ends those that have been idle for too long. Bound users have workers, and a
/// reception, of their own, which stand behind the others at the processor and share no lock with them: a thread's
/// priority can be lowered, but not be raised again, and whoever waited for a lock of theirs would stand there, too.
class FrameServer::Impl {
 public:
  Impl(FrameServerOptions options, Handler handler)
      : shared_{std::move(options), std::move(handler), base::UniqueFd(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK))},
        listener_(Listen(shared_.options.socket_path, shared_.options.socket_mode)),
        control_(epoll_create1(EPOLL_CLOEXEC)),
        others_(shared_, FrameWorkers::Whose::kOthers),
        has_bound_(shared_.options.users.is_bound != nullptr),
        bound_(shared_, FrameWorkers::Whose::kBoundUsers) {
    FERROX_FAIL_IF(!control_.Valid() || !shared_.stopped.Valid(), Error::kInternal, "epoll: " + ErrnoText());
    WatchDescriptor(control_, EPOLL_CTL_ADD, listener_.Get(), kListenId, EPOLLIN);
    WatchDescriptor(control_, EPOLL_CTL_ADD, shared_.stopped.Get(), kStopId, EPOLLIN);
  }
  Impl(const Impl&) = delete;
  Impl& operator=(const Impl&) = delete;
  ~Impl() { (void)unlink(shared_.options.socket_path.c_str()); }

  void Run(int stop_fd) {
    others_.Start();
    if (has_bound_) {
      bound_.Start();
      reception_ = std::make_unique<Reception>(shared_.options.connections_max,
                                               [this](auto newcomer) { AdmitBound(std::move(newcomer)); });
    }
    if (stop_fd >= 0) WatchDescriptor(control_, EPOLL_CTL_ADD, stop_fd, kStopId, EPOLLIN);
    while (!shared_.stop) {
      epoll_event event = {};
      const int count = epoll_wait(control_.Get(), &event, 1, TimeoutMs());
      if (count == 1 && event.data.u64 == kListenId) Accept();
      if (count == 1 && event.data.u64 == kStopId) break;
      EndIdle();
      if (std::exchange(has_crowd_, false)) (void)poll(nullptr, 0, kCrowdMs);
    }
    Stop();
    shared_.options.on_stop();
    reception_.reset();
    others_.Join();
    bound_.Join();
  }

  void Stop() {
    shared_.stop = true;
    const uint64_t one = 1;
    (void)!write(shared_.stopped.Get(), &one, sizeof(one));  // never read: it stays readable and wakes every thread
  }

 private:
  /// How long the accepting thread may sleep. Without connections nothing can time out, and it is not woken at all.
  int TimeoutMs() {
    const bool is_empty = (reception_ == nullptr || reception_->IsEmpty()) && others_.IsEmpty() && bound_.IsEmpty();
    return is_empty ? -1 : kTickMs;
  }

  void Accept() {
    for (;;) {
      base::UniqueFd fd(accept4(listener_.Get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
      const bool full = !fd.Valid() && (errno == EMFILE || errno == ENFILE);
      if (!fd.Valid() && !full) return;
      if (fd.Valid()) {
        has_crowd_ = Greet(std::move(fd)) || has_crowd_;
      } else if (!bound_.Admit(nullptr) && !others_.Admit(nullptr)) {
        // The listener stays readable: a pause keeps the loop from spinning until a descriptor is free.
        return (void)poll(nullptr, 0, kFullMs);
      }
    }
  }

  /// Whether it is a bound user's.
  bool Greet(base::UniqueFd fd) {
    auto newcomer = std::make_unique<FrameConnection>();
    newcomer->peer = PeerOf(fd.Get());
    newcomer->fd = std::move(fd);
    newcomer->is_bound = has_bound_ && shared_.options.users.is_bound(newcomer->peer);
    const bool is_bound = newcomer->is_bound;
    if (is_bound) {
      reception_->Take(std::move(newcomer));
    } else {
      (void)others_.Admit(std::move(newcomer));
    }
    return is_bound;
  }

  void AdmitBound(std::unique_ptr<FrameConnection> newcomer) {
    const UserLimits& users = shared_.options.users;
    newcomer->is_for_many = users.is_for_many != nullptr && users.is_for_many(newcomer->peer);
    (void)bound_.Admit(std::move(newcomer));
  }

  void EndIdle() {
    const auto now = SteadyClock::now();
    if (now < next_idle_check_) return;
    next_idle_check_ = now + std::chrono::milliseconds(kTickMs);
    others_.EndIdle(now - shared_.options.idle_timeout);
    bound_.EndIdle(now - shared_.options.idle_timeout);
  }

  FrameWorkers::Shared shared_;
  base::UniqueFd listener_;
  base::UniqueFd control_;  ///< what the accepting thread waits for
  FrameWorkers others_;
  const bool has_bound_;
  FrameWorkers bound_;                    ///< without threads where nobody is bound
  std::unique_ptr<Reception> reception_;  ///< while Run runs, where anybody is bound
  // Of the accepting thread alone.
  SteadyClock::time_point next_idle_check_;
  bool has_crowd_ = false;  ///< bound users have connected just now
};

FrameServer::FrameServer(FrameServerOptions options, Handler handler)
    : impl_(std::make_unique<Impl>(std::move(options), std::move(handler))) {}
FrameServer::~FrameServer() = default;
void FrameServer::Run(int stop_fd) { impl_->Run(stop_fd); }
void FrameServer::Stop() { impl_->Stop(); }

}  // namespace ferrox::services
