#include "services/fileindexd/queue_pass.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

#include "common/error.h"
#include "fileindex/optree/optree.h"
#include "fileindex/status_mgr.h"
#include "services/fileindexd/operation_runner.h"
#include "services/fileindexd/queue_tail.h"

namespace ferrox::indexd {

namespace {

using std::chrono::steady_clock;

constexpr std::chrono::milliseconds kFoldersPoll(200);

}  // namespace

QueuePass::QueuePass(ShareContext& context, IndexKeeper& keeper, ShareAvailability& availability,
                     std::set<std::string>& early_writes)
    : context_(context),
      keeper_(keeper),
      availability_(availability),
      early_writes_(early_writes),
      held_(context.root),
      mount_point_(MountPointOf(context.root, context.environment.is_mount_point)),
      queue_(context.queue.Path()) {}

bool QueuePass::Run() {
  availability_.Check();
  if (!Detach()) return false;
  // Loaded only now: of folders that change later, the events are in a later queue.
  const ShareFolders folders = context_.folders.Load();
  // The files of an inner share that is being renamed would be read for this one, too.
  if (folders.MissInnerOf(context_.applied.Get())) AwaitOtherFolders(folders);
  const std::set<uint64_t> changed_files = ChangedNumbersIn(context_.queue.DetachedPath());
  services::Exclusions exclusions(
      context_.root, folders.Exclusions(),
      [this](const std::string& path, const std::string& reason) { context_.status.PatternFileRead(path, reason); });
  OperationRunner runner({context_, folders, exclusions, keeper_.Index(), held_, changed_files, keeper_.MayHoldStrays(),
                          [&] { AwaitOtherFolders(folders); }, early_writes_});
  CarryOut(runner, folders, changed_files.size() > kChangedNumbersMax);
  // What went away in the meantime, with its volume for example, looked as if it had been deleted.
  held_.CheckStillThere();
  availability_.Check();
  MarkIfFoldersChanged(runner, folders);
  queue_.DeleteTmp();
  // While the queue was still there, a change made since may have been taken for one that it covers.
  MarkIfFoldersChanged(runner, folders);
  context_.applied.Set(folders, mount_point_);
  context_.status.EndPass();
  return true;
}

/// @return whether there is a detached queue now; it may be one that an earlier pass has left.
bool QueuePass::Detach() {
  context_.queue.AwaitWriter(context_.interruption);
  return queue_.PrepareTmpQueue() || context_.queue.IsDetached();
}

/// Where the folders differ from those that the index is in line with is compared, too: a reindex that waits in the
/// queue swallows the event of a folder, or of a user, that was renamed into its place, and so what is to be done at
/// the old one.
void QueuePass::CarryOut(OperationRunner& runner, const ShareFolders& folders, bool whole_share) {
  const auto each = [this](const std::function<void(const fileindex::OP&)>& take) {
    (void)queue_.ProcessOP([&take](const std::shared_ptr<fileindex::OP>& op) { take(*op); }, true);
  };
  std::vector<std::string> also_compare = folders.DifferingFrom(context_.applied.Get());
  if (whole_share) also_compare.push_back(context_.root);
  try {
    runner.Run(each, also_compare);
  } catch (const Interrupted&) {
    runner.KeepWhatIsDone();
    throw;
  }
}

/// Blocks while the folders stay as they are, up to the worker's patience. @throws Interrupted when they have changed:
/// the pass then begins anew with those.
void QueuePass::AwaitOtherFolders(const ShareFolders& folders) {
  const auto end = steady_clock::now() + context_.environment.patience;
  while (steady_clock::now() < end) {
    if (!context_.folders.AreStill(folders)) throw Interrupted();
    context_.interruption.SleepFor(kFoldersPoll);
  }
}

/// The library queues nothing below a path whose reindex it sees in the queue, although the folders of this pass may be
/// those of before the change. So the share is marked as needing a reindex, and on the disk before the queue is gone.
void QueuePass::MarkIfFoldersChanged(const OperationRunner& runner, const ShareFolders& folders) {
  if (!runner.HadReindex() || context_.folders.AreStill(folders)) return;
  fileindex::StatusMgr().SetShareStatus(context_.share, fileindex::StatusMgr::kNeedReindex);
}

}  // namespace ferrox::indexd
