#include "services/support/connection_table.h"

#include <algorithm>
#include <utility>

namespace ferrox::services {

namespace {

bool IsIdle(const FrameConnection& connection) {
  return !connection.busy && connection.state != FrameConnection::State::kWaiting;
}

ConnectionTable::Room RoomOf(FrameConnection* to_end) { return {to_end != nullptr, to_end}; }

}  // namespace

FrameConnection* ConnectionTable::Find(uint64_t id) const {
  const auto it = connections_.find(id);
  return it == connections_.end() ? nullptr : it->second.get();
}

void ConnectionTable::Add(std::unique_ptr<FrameConnection> connection) {
  const uint64_t id = connection->id;
  connections_[id] = std::move(connection);
}

ConnectionTable::Room ConnectionTable::RoomFor(const FrameConnection* newcomer) const {
  const auto is_own = [newcomer](const FrameConnection& one) { return one.peer.uid == newcomer->peer.uid; };
  if (newcomer != nullptr && newcomer->is_bound && !newcomer->is_for_many) {
    const auto own = std::count_if(connections_.begin(), connections_.end(),
                                   [&is_own](const auto& entry) { return is_own(*entry.second); });
    if (own >= each_max_) return RoomOf(LongestIdleOf(is_own));
  }
  if (newcomer != nullptr && connections_.size() < all_max_) return {};
  return RoomOf(LongestIdleOf([](const FrameConnection&) { return true; }));
}

std::vector<FrameConnection*> ConnectionTable::IdleSince(FrameConnection::SteadyClock::time_point before) const {
  std::vector<FrameConnection*> idle;
  for (const auto& [id, connection] : connections_) {
    if (IsIdle(*connection) && connection->last_progress < before) idle.push_back(connection.get());
  }
  return idle;
}

template <typename Which>
FrameConnection* ConnectionTable::LongestIdleOf(Which which) const {
  FrameConnection* longest = nullptr;
  for (const auto& [id, connection] : connections_) {
    if (!IsIdle(*connection) || !which(*connection)) continue;
    if (longest == nullptr || connection->last_progress < longest->last_progress) longest = connection.get();
  }
  return longest;
}

}  // namespace ferrox::services
