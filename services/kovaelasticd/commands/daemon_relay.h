#pragma once

#include <chrono>
#include <optional>

#include <json/value.h>

#include "base/mutex.h"
#include "services/kovaelasticd/commands/fresh_rounds.h"
#include "services/kovaelasticd/indices/registry.h"

namespace ferrox::engine {

/// What the engine asks of the index daemon and the notification daemon, whose sockets are root's and the owner's, for
/// users. What it learns there is of all shares: whoever uses it tells a user no more than what concerns shares that
/// the user can enter. Any thread may call any member.
class DaemonRelay {
 public:
  /// `registry`, which outlives this, knows the shares.
  explicit DaemonRelay(Registry& registry) : registry_(registry) {}

  FreshRounds& Fresh() { return fresh_; }
  /// The index daemon's "status", as it was a second ago at most; null when it does not answer within some seconds.
  /// Callers that come at once share one answer.
  Json::Value IndexingStatus();

 private:
  FreshRounds::Outcome AskWhetherFresh() const;

  Registry& registry_;
  FreshRounds fresh_{[this] { return AskWhetherFresh(); }};
  base::Mutex status_mutex_;  ///< held while the daemon is asked
  Json::Value status_ BASE_GUARDED_BY(status_mutex_);
  std::optional<std::chrono::steady_clock::time_point> status_at_ BASE_GUARDED_BY(status_mutex_);
};

}  // namespace ferrox::engine
