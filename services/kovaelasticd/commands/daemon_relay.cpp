#include "services/kovaelasticd/commands/daemon_relay.h"

#include <utility>
#include <vector>

#include "common/paths.h"
#include "wire/await_changes.h"
#include "wire/frame_client.h"

namespace ferrox::engine {

namespace {

using std::chrono::steady_clock;

constexpr std::chrono::seconds kLongestRound(30);
/// Of a round: who waits for a share that takes longer waits for another round, and holds up nobody else.
constexpr std::chrono::seconds kLongestIndexing(2);
constexpr std::chrono::seconds kStatusKept(1);
/// The daemon itself waits 2 s for the engine at most.
constexpr std::chrono::seconds kStatusWait(4);

}  // namespace

FreshRounds::Outcome DaemonRelay::AskWhetherFresh() const {
  std::vector<std::string> shares;
  for (const Registry::Listed& index : registry_.List()) {
    if (index.share != nullptr) shares.push_back(index.share->share);
  }
  if (shares.empty()) return std::set<std::string>();
  const wire::ChangesReport report = wire::AwaitChanges(shares, kLongestRound, kLongestIndexing);
  if (!report.IsKnown()) return std::nullopt;
  std::set<std::string> behind;
  for (const auto& [share, reason] : report.behind) behind.insert(share);
  return behind;
}

Json::Value DaemonRelay::IndexingStatus() {
  const base::MutexLock lock(status_mutex_);
  if (status_at_.has_value() && steady_clock::now() < *status_at_ + kStatusKept) return status_;
  status_ = wire::AskDaemon(kFileIndexdSocket, "status", Json::Value(), kStatusWait).data;
  status_at_ = steady_clock::now();
  return status_;
}

}  // namespace ferrox::engine
