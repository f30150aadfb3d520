#pragma once

#include <sys/types.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>

#include "base/unique_fd.h"
#include "services/support/frame_server.h"

namespace ferrox::services {

/// One client of a FrameServer and where its present frame stands: a request is received whole, answered, its reply
/// sent whole, and the next one received. The descriptor does not block, so that neither step waits for the peer.
/// Belongs to the thread that is at work on it.
struct FrameConnection {
  using SteadyClock = std::chrono::steady_clock;
  /// What a request is read through; one for each thread.
  using Chunk = std::array<char, 64 * 1024>;
  /// kWaiting: the request is complete and waits for its turn (RequestGate).
  enum class State { kReceiving, kWaiting, kSending };
  /// kMore: the peer must go on first. kBroken: it has gone, or announces more than it may; nothing more comes.
  enum class Progress { kMore, kComplete, kBroken };

  /// Reads what is there, up to the end of the frame. Memory grows with what arrives, not with what is announced.
  Progress Receive(const FrameServerOptions& options, Chunk& chunk);
  void BeginSending(FrameReply reply);
  /// Sends as much as the kernel takes.
  Progress Send();
  void BeginReceiving();

  uint64_t id = 0;
  base::UniqueFd fd;
  Peer peer;
  base::UniqueFd descriptor;  ///< peer.descriptor
  bool busy = false;          ///< a thread is at work on it
  bool is_bound = false;      ///< by UserLimits
  bool is_for_many = false;   ///< bound, but not as one user
  State state = State::kReceiving;
  std::string body;  ///< of the request as far as it has come, or of the reply
  SteadyClock::time_point last_progress = SteadyClock::now();

 private:
  static constexpr size_t kHeaderBytes = 4;

  /// The length of the body, once the header is there.
  std::optional<uint32_t> BodyBytes() const;
  ssize_t ReceiveBytes(Chunk& chunk, size_t size, bool takes_descriptors);

  bool SendHeader();

  std::array<char, kHeaderBytes> header_ = {};
  base::UniqueFd sent_descriptor_;  ///< goes with the header of the reply
  size_t done_ = 0;                 ///< of header and body, received or sent
};

}  // namespace ferrox::services
