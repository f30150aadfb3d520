#include "services/fileindexd/operation_runner.h"

#include <syslog.h>

#include <cstdint>
#include <exception>

#include "base/path.h"
#include "common/log.h"
#include "services/fileindexd/file_presence.h"

namespace ferrox::indexd {

namespace {

/// Up to so many operations are a change that somebody waits for, rather than a folder that is copied: their tasks go
/// in front of those of other shares.
constexpr uint64_t kUrgentOperations = 4;

/// One that is left out itself counts nevertheless.
bool IsIgnoreFile(const std::string& path) { return base::NameOf(path) == services::kIgnoreFileName; }

}  // namespace

OperationRunner::OperationRunner(const PassContext& context)
    : context_(context),
      rules_(context.share.share, context.share.root, context.folders, context.exclusions),
      writer_(context.index, context.folders, context.exclusions, context.share.status),
      early_writes_before_(context.early_writes),
      anchors_(context.share.root, context.folders, writer_),
      changes_({context.share.share, context.share.root, context.folders, context.exclusions,
                context.share.queue.Path(), writer_, context.share.environment.pool, context.share.interruption,
                context.share.environment.early_write_interval}),
      access_({context.share.root, context.share.queue.Path(), context.exclusions, context.index, writer_, anchors_,
               context.share.interruption, context.share.environment.early_write_interval}),
      commits_(writer_, anchors_, changes_, access_),
      moves_(context_, rules_, writer_),
      disk_(context_, rules_, writer_, commits_) {}

OperationRunner::~OperationRunner() { StopFollowers(); }

void OperationRunner::Run(const std::function<void(const TakeOperation&)>& each,
                          const std::vector<std::string>& also_compare) {
  uint64_t operations = 0;
  each([&operations](const fileindex::OP&) { ++operations; });
  context_.share.status.BeginPass(operations);
  moves_.SetUrgent(operations <= kUrgentOperations);
  disk_.SetUrgent(operations <= kUrgentOperations);

  access_.Start();
  each([this](const fileindex::OP& op) { CarryOut(op, Stage::kMove); });
  moves_.Finish();
  moves_.MoveRenamedFolders(also_compare);
  const bool moved_strays = context_.may_hold_strays && moves_.MoveStrays();
  // To compare a folder with the disk takes as long as it is large. Before that, what was in a folder is found under
  // its new name, or no longer.
  if (moves_.ChangedFolder()) commits_.Commit();

  changes_.Start();
  each([this](const fileindex::OP& op) {
    CarryOut(op, Stage::kDisk);
    context_.share.status.OperationDone();
  });
  for (const std::string& path : also_compare) disk_.CompareOnce(path);
  if (moved_strays) disk_.CompareOnce(context_.share.root);
  disk_.Wait();
  StopFollowers();
  changes_.ThrowIfFailed();
  access_.ThrowIfFailed();
  disk_.RecheckEarlyWrites(early_writes_before_);
  context_.early_writes = changes_.EarlyWrites();
  disk_.RefreshLinked();
  commits_.Commit();
}

/// Passes over what is not the share's, and hands the rest to the stage.
void OperationRunner::CarryOut(const fileindex::OP& op, Stage stage) {
  context_.share.interruption.Check();
  const std::string path = op.node->GetPath();
  const bool ours = base::IsAtOrBelow(path, context_.share.root);
  if (!ours && op.op != fileindex::OP_FULL_REINDEX) {
    if (stage == Stage::kMove) {
      Log(LOG_WARNING, "queue of share %s: %s lies outside of it", context_.share.share.c_str(), path.c_str());
    }
    return;
  }
  if (IsTooLong(path)) {
    // What was moved there has left the index; all else there was never in it.
    if (stage == Stage::kDisk && op.op == fileindex::OP_RENAME) disk_.CompareOnce(op.path);
    return;
  }
  // The queue also has the changes in indexed shares that lie in this one; those have queues of their own.
  const bool is_inner = context_.folders.IsInInner(path);
  if (is_inner && (op.op != fileindex::OP_RENAME || context_.folders.IsInInner(op.path))) return;
  if (op.op == fileindex::OP_DELETE) context_.share.status.PatternFilesGone(path);
  if (op.op == fileindex::OP_RENAME) context_.share.status.PatternFilesGone(op.path);
  // In a folder that is left out, a program may change thousands of files a second.
  const bool is_excluded = rules_.IsExcluded(path) && !IsIgnoreFile(path);
  if (is_excluded && (op.op != fileindex::OP_RENAME || rules_.IsExcluded(op.path))) return;
  if (op.op == fileindex::OP_RENAME && stage == Stage::kMove) AwaitOwner(path, op.path);
  stage == Stage::kMove ? moves_.CarryOut(op.op, path, op.path) : disk_.CarryOut(op.op, path, op.path);
  commits_.CommitIfDue();
}

/// After the folder of an indexed share that lies in this one was renamed, the share table says a moment later whose
/// folder it is now. Its files are not read for this share meanwhile.
void OperationRunner::AwaitOwner(const std::string& path, const std::string& old_path) const {
  const bool was_inner =
      context_.folders.Inner().count(old_path) != 0 || context_.share.applied.Get().Inner().count(old_path) != 0;
  if (was_inner && !context_.folders.IsInInner(path)) context_.await_folders();
}

void OperationRunner::KeepWhatIsDone() noexcept {
  try {
    if (writer_.HasUncommitted()) commits_.Commit();
  } catch (const std::exception&) {
    // What is not committed is done again when the queue is taken up again.
  }
}

void OperationRunner::StopFollowers() {
  access_.Stop();
  changes_.Stop();
  context_.early_writes.insert(changes_.EarlyWrites().begin(), changes_.EarlyWrites().end());
}

}  // namespace ferrox::indexd
