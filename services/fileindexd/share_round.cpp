#include "services/fileindexd/share_round.h"

#include <vector>

#include "common/error.h"
#include "fileindex/optree/optree.h"
#include "fileindex/status_mgr.h"
#include "services/fileindexd/queue_pass.h"

namespace ferrox::indexd {

namespace {

using fileindex::StatusMgr;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

/// An event that asks for nothing but a pass, which compares what differs from the folders of the last one.
constexpr int kPassEvent = 0;
constexpr int kClearedByReindex = StatusMgr::kNeedReindex | StatusMgr::kSecondCondition;

}  // namespace

void ShareRound::Run() {
  served_sync_ = context_.syncs.Last();
  availability_.Check();
  PrepareIndexAndQueue();
  RunPasses();
  keeper_.FinishRebuilding();
  keeper_.FinishPreparing();
}

/// Makes sure of the index, and queues what is to be done although no other process queues an event for it.
void ShareRound::PrepareIndexAndQueue() {
  if (availability_.WasAway()) (void)context_.queue.Add(fileindex::EVENT_REINDEX, context_.root);
  availability_.ClearAway();
  const ShareFolders folders = context_.folders.Load();
  keeper_.EnsureExists(
      retry_.HasFailedFor(Error::kEngineNoSuchIndex, context_.environment.patience, steady_clock::now()));
  keeper_.TellShare();
  keeper_.FollowRebuilding();
  // No event says that indexed shares in this one came or went, or that patterns changed; a pass compares the folders.
  const bool is_queued = context_.queue.HasLines() || context_.queue.IsDetached();
  if (!is_queued && folders.DiffersWithoutEvent(context_.applied.Get())) {
    (void)context_.queue.Add(kPassEvent, context_.root);
  }
}

/// A detached queue that was there before holds only a part of what the sync requests wait for.
void ShareRound::RunPasses() {
  while (true) {
    served_sync_ = context_.syncs.Last();
    QueueNeededReindex();
    const bool begun_before = context_.queue.IsDetached();
    if (!begun_before && !context_.queue.HasLines()) return;
    if (!begun_before) Gather();
    if (QueuePass(context_, keeper_, availability_, early_writes_).Run()) last_pass_end_ = steady_clock::now();
    if (!begun_before) context_.syncs.Done(served_sync_);
  }
}

/// Turns the share's mark into a queued reindex. A queue that takes no event keeps the mark for the next time.
void ShareRound::QueueNeededReindex() {
  if ((StatusMgr().GetShareStatus(context_.share) & StatusMgr::kNeedReindex) == 0) return;
  if (context_.queue.Add(fileindex::EVENT_REINDEX, context_.root)) {
    StatusMgr().UnsetShareStatus(context_.share, kClearedByReindex);
  }
}

/// A change after a quiet time is carried out at once; under load, passes keep this distance and so grow with the load.
/// A sync request does not wait for that.
void ShareRound::Gather() {
  const auto next_pass = last_pass_end_ + context_.environment.gather_time;
  const auto left = std::chrono::ceil<milliseconds>(next_pass - steady_clock::now());
  if (left.count() > 0 && !context_.syncs.HasPending()) context_.watch.WaitForWake(left);
  context_.interruption.Check();
  served_sync_ = context_.syncs.Last();
}

bool ShareRound::AwaitsEvent() {
  const ShareFolders folders = context_.folders.Load();
  const std::vector<std::string> differing = folders.DifferingFrom(context_.applied.Get());
  const bool strays = keeper_.HoldsStrays();
  if (!strays && folders.DiffersWithoutEvent(context_.applied.Get())) return true;  // since this round began
  if (!strays && differing.empty()) {
    awaits_event_since_.reset();
    return false;
  }
  const auto now = steady_clock::now();
  if (!awaits_event_since_) awaits_event_since_ = now;
  if (now - *awaits_event_since_ < context_.environment.patience) return true;
  // One differing folder is enough: the pass compares the others, too.
  strays ? context_.queue.Add(fileindex::EVENT_REINDEX, context_.root)
         : context_.queue.Add(fileindex::EVENT_UPDATE_CFG, differing.front());
  return true;
}

}  // namespace ferrox::indexd
