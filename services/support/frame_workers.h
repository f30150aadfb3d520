#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <thread>
#include <vector>

#include "base/mutex.h"
#include "base/unique_fd.h"
#include "services/support/connection_table.h"
#include "services/support/frame_connection.h"
#include "services/support/frame_server.h"
#include "services/support/request_gate.h"

namespace ferrox::services {

/// Some of a FrameServer's connections, and the threads that answer them: each takes a connection that can be read or
/// written, does what can be done without waiting for the peer, and gives it back. So a request is answered by the
/// thread that has read it, and a slow peer occupies none.
///
/// The threads share one epoll set. EPOLLONESHOT disarms a connection when it is reported to one of them, so that no
/// other gets it until Give arms it again. A connection is known by a number that is never used twice, since its
/// descriptor may be a new connection's by the time that a thread hears of the old one.
class FrameWorkers {
 public:
  enum class Whose { kBoundUsers, kOthers };
  /// What those of one server have in common. It must outlive them.
  struct Shared {
    const FrameServerOptions options;
    const FrameServer::Handler handler;
    base::UniqueFd stopped;                  ///< an eventfd; readable once the server stops
    std::atomic<bool> stop{false};           ///< set before that
    std::atomic<uint64_t> request_bytes{0};  ///< of all requests that are not answered yet
  };

  /// @throws Error kInternal.
  FrameWorkers(Shared& shared, Whose whose);
  FrameWorkers(const FrameWorkers&) = delete;
  FrameWorkers& operator=(const FrameWorkers&) = delete;
  ~FrameWorkers() { Join(); }

  void Start();
  /// Waits for the threads, which end once the server stops.
  void Join();

  // The following may be called by any thread.

  /// Ends another connection where there is no room for one more. Null: only that, for want of a descriptor.
  /// @return whether there is room now; without it the newcomer is ended.
  bool Admit(std::unique_ptr<FrameConnection> newcomer);
  bool IsEmpty();
  /// Ends connections that made no progress since then.
  void EndIdle(FrameConnection::SteadyClock::time_point before);

 private:
  using Chunk = FrameConnection::Chunk;
  using Progress = FrameConnection::Progress;
  enum class Next { kReceive, kSend, kEnd, kTurn };

  void Serve();
  FrameConnection* Take(uint64_t id);
  FrameConnection* TakeWaiting();
  void Give(FrameConnection& connection, Next next);
  Next Advance(FrameConnection& connection, Chunk& chunk);
  RequestGate::Admission Enter(FrameConnection& connection);
  void Answer(FrameConnection& connection, bool is_refused);
  FrameReply Handle(const FrameConnection& connection);
  void Leave(const FrameConnection& connection);
  void End(FrameConnection& connection) BASE_REQUIRES(mutex_);

  Shared& shared_;
  const bool is_for_bound_;
  const unsigned at_work_max_;
  base::UniqueFd ready_;  ///< connections that nobody is at work on; what the threads wait for
  std::vector<std::thread> threads_;
  base::Mutex mutex_;
  ConnectionTable connections_ BASE_GUARDED_BY(mutex_);  ///< what a busy one holds is its thread's alone
  RequestGate gate_ BASE_GUARDED_BY(mutex_);             ///< of bound users' requests
  uint64_t next_id_ BASE_GUARDED_BY(mutex_);
};

/// Adds or changes what an epoll set is to report of a descriptor.
void WatchDescriptor(const base::UniqueFd& epoll, int operation, int fd, uint64_t id, uint32_t events);

}  // namespace ferrox::services
