#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <set>
#include <string>

#include "services/fileindexd/index_keeper.h"
#include "services/fileindexd/retry_policy.h"
#include "services/fileindexd/share_availability.h"
#include "services/fileindexd/share_context.h"

namespace ferrox::indexd {

/// One round of a share's worker: brings the index in line with what is queued and with the folders, by as many passes
/// as that takes. Keeps what one round has to know of those before it. Belongs to the worker's thread.
class ShareRound {
 public:
  /// All outlive it.
  ShareRound(ShareContext& context, IndexKeeper& keeper, ShareAvailability& availability, const RetryPolicy& retry)
      : context_(context), keeper_(keeper), availability_(availability), retry_(retry) {}

  /// Returns when nothing is queued. @throws Interrupted; Error when the round is to be tried again.
  void Run();
  /// After Run: whether the index still is not what the folders want. The event that says so may be yet to come, as
  /// management operations save folders first and queue events then. When it has not come within the worker's patience,
  /// its sender has died, and the event is queued here.
  bool AwaitsEvent();
  /// The last sync request that the present or last round serves.
  uint64_t ServedSync() const { return served_sync_; }

 private:
  void PrepareIndexAndQueue();
  void RunPasses();
  void QueueNeededReindex();
  void Gather();

  ShareContext& context_;
  IndexKeeper& keeper_;
  ShareAvailability& availability_;
  const RetryPolicy& retry_;
  uint64_t served_sync_ = 0;
  std::set<std::string> early_writes_;  ///< by earlier passes, of files whose lines may wait yet
  std::chrono::steady_clock::time_point last_pass_end_;
  std::optional<std::chrono::steady_clock::time_point> awaits_event_since_;
};

}  // namespace ferrox::indexd
