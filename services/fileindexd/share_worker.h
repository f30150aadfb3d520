#pragma once

#include <chrono>
#include <cstdint>
#include <future>
#include <string>
#include <thread>
#include <vector>

#include <json/value.h>

#include "services/fileindexd/index_keeper.h"
#include "services/fileindexd/inner_share_changes.h"
#include "services/fileindexd/queue_progress.h"
#include "services/fileindexd/share_context.h"
#include "services/fileindexd/worker_loop.h"

namespace ferrox::indexd {

/// Keeps the index of one share in step with its queue, in a thread of its own, and speaks for it: starts, wakes and
/// stops the thread, and answers what request threads ask. The work itself goes
///   WorkerLoop::Run -> ShareRound::Run -> QueuePass::Run -> OperationRunner::Run.
class ShareWorker {
 public:
  /// @throws Error kNoSuchShare; kInternal.
  ShareWorker(const std::string& share, const WorkerEnvironment& environment);
  ShareWorker(const ShareWorker&) = delete;
  ShareWorker& operator=(const ShareWorker&) = delete;
  ~ShareWorker() { Stop(); }

  /// Begins to work in a thread.
  void Start();
  /// Asks the work to end where it is, for good; the queue stays as it is and is taken up again by the next worker.
  void RequestStop();
  /// The same, and waits for that. What another daemon does not answer within a second is given up. Like Start, for one
  /// thread at a time. @return whether the thread has ended; a file system that hangs may hold it.
  bool StopWithin(std::chrono::milliseconds patience);
  /// The same, however long it takes.
  void Stop();
  bool IsStopping() const { return context_.stopping; }
  /// Stops, and removes what is kept of the share's folders: it is not indexed here any more.
  void Forget();
  /// Begins the next round at once, or ends the present one when the worker is stopping or indexing is paused.
  void Wake();

  /// Says which folders of indexed shares lie in this share now; a change is carried out at once. From any thread, one
  /// at a time.
  void SetInnerShares(const std::vector<std::string>& folders);
  /// Checks whether the engine has made the index anew, and fills it then. From any thread.
  void CheckIndex();

  /// Asks that all that is queued now be in the index soon. @return what AwaitSync waits for; 0 when nothing is to be
  /// done. Like AwaitSync, from any thread.
  uint64_t RequestSync();
  /// Blocks until it is, at most until `end`. @return "", or a sentence that names share, reason and remedy.
  std::string AwaitSync(uint64_t request, QueueProgress::TimePoint end);
  /// Ends all waiting in AwaitSync, because the daemon stops.
  void EndSyncs(const std::string& reason) { context_.syncs.End(reason); }

  /// The share's folder when the worker was made; once it is another, this worker is of no use any more.
  const std::string& Root() const { return context_.root; }

  /// Carries out what is queued now, in the calling thread. Only for a worker that was not started.
  /// @throws Interrupted; Error when it is to be tried again.
  void RunOnce() { loop_.RunOnce(); }

  /// How many files have been read for their content.
  uint64_t FilesRead() const { return context_.status.FilesRead(); }
  static constexpr std::chrono::milliseconds kEngineWait{2000};
  /// The share's object in the answer to "status" (docs/formats/daemon.md). Blocks at most for `engine_wait`, for the
  /// engine's figures.
  Json::Value Status(std::chrono::milliseconds engine_wait = kEngineWait);

 private:
  bool IsUpToDate() const;

  ShareContext context_;
  IndexKeeper keeper_;
  InnerShareChanges inner_shares_;
  WorkerLoop loop_;
  std::chrono::steady_clock::time_point stop_requested_at_;
  std::promise<void> end_;
  std::future<void> ended_ = end_.get_future();  ///< once the thread has
  std::thread thread_;
};

}  // namespace ferrox::indexd
