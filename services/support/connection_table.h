#pragma once

#include <cstdint>
#include <memory>
#include <unordered_map>
#include <vector>

#include "services/support/frame_connection.h"

namespace ferrox::services {

/// Connections, and which of them has to go when there is no room for one more. Not for several threads at once.
class ConnectionTable {
 public:
  /// `each_max`: of one bound user who does not ask for many.
  ConnectionTable(unsigned all_max, unsigned each_max) : all_max_(all_max), each_max_(each_max) {}

  bool IsEmpty() const { return connections_.empty(); }
  /// Null when it has been ended.
  FrameConnection* Find(uint64_t id) const;
  void Add(std::unique_ptr<FrameConnection> connection);
  void Remove(uint64_t id) { connections_.erase(id); }

  struct Room {
    bool is_there = true;
    FrameConnection* to_end = nullptr;  ///< this one goes first
  };
  /// Of those that can go, since nobody is at work on them, the one without progress for the longest time does; of a
  /// bound user with too many, one of these. Null: no further connection can be made at all.
  Room RoomFor(const FrameConnection* newcomer) const;
  /// Those that can go and made no progress since `before`.
  std::vector<FrameConnection*> IdleSince(FrameConnection::SteadyClock::time_point before) const;

 private:
  template <typename Which>
  FrameConnection* LongestIdleOf(Which which) const;

  const unsigned all_max_, each_max_;
  std::unordered_map<uint64_t, std::unique_ptr<FrameConnection>> connections_;
};

}  // namespace ferrox::services
