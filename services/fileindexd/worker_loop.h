#pragma once

#include <atomic>
#include <chrono>
#include <string>

#include "common/error.h"
#include "services/fileindexd/index_keeper.h"
#include "services/fileindexd/inner_share_changes.h"
#include "services/fileindexd/retry_policy.h"
#include "services/fileindexd/share_availability.h"
#include "services/fileindexd/share_context.h"
#include "services/fileindexd/share_round.h"

namespace ferrox::indexd {

/// What a share's worker does in its thread: rounds, the waiting between them, and what follows a round that failed.
class WorkerLoop {
 public:
  /// All outlive it.
  WorkerLoop(ShareContext& context, IndexKeeper& keeper, InnerShareChanges& inner_shares);

  /// Returns once the context says that the worker is to end. Everything that blocks in it ends soon after an
  /// Interruption::Request and a FileWatch::Wake.
  void Run();
  /// One round, without what follows a failure. For tests and a worker without a thread. @throws as ShareRound::Run.
  void RunOnce() { round_.Run(); }
  /// Whether the index was in line with folders and queue when the last round ended, and no other has begun. From any
  /// thread.
  bool IsSettled() const { return settled_; }

 private:
  bool MayWork() const { return !context_.stopping && !context_.environment.pause.Paused(); }
  std::chrono::milliseconds Round();
  std::chrono::milliseconds OnSuccess();
  std::chrono::milliseconds OnFailure(const Error& error);
  std::chrono::milliseconds OnUnexpected(const std::string& reason);
  void Report(const Retry& retry, const std::string& reason);

  ShareContext& context_;
  IndexKeeper& keeper_;
  InnerShareChanges& inner_shares_;
  ShareAvailability availability_;
  RetryPolicy retry_;
  ShareRound round_;
  std::atomic<bool> settled_{false};
};

}  // namespace ferrox::indexd
