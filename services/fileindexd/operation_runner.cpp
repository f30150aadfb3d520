#include "services/fileindexd/operation_runner.h"

#include <fcntl.h>
#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include <kova/content_extract.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/log.h"
#include "common/unique_fd.h"
#include "services/fileindexd/comparison.h"
#include "services/fileindexd/file_count.h"

namespace ferrox::indexd {

namespace {

using fileindex::FileIndexOP;

constexpr auto kCommitInterval = std::chrono::seconds(5);
/// A comparison that has seen so many files tells how many there are.
constexpr uint64_t kFilesBeforeCount = 500;

bool IsCurrent(const IndexedEntry& indexed, const struct stat& status) {
  return indexed.stamp == KOVA::CONTENT_EXTRACT::Stamp(status);
}

enum class Presence { kThere, kGone, kUnknown };

/// What is at `path` for the index: links count as nothing.
Presence LookAt(const std::string& path, struct stat& status) {
  if (lstat(path.c_str(), &status) == 0) return S_ISLNK(status.st_mode) ? Presence::kGone : Presence::kThere;
  return errno == ENOENT || errno == ENOTDIR || errno == ELOOP ? Presence::kGone : Presence::kUnknown;
}

}  // namespace

struct OperationRunner::Handler {
  using Function = void (OperationRunner::*)(const std::string& path, const std::string& old_path);
  FileIndexOP op;
  Function move;
  Function look;
};

/// Until kinds can be switched off per folder, a changed configuration asks for nothing that a comparison does not do.
constexpr OperationRunner::Handler OperationRunner::kHandlers[] = {
    {fileindex::OP_DELETE, &OperationRunner::MoveDelete, &OperationRunner::LookDelete},
    {fileindex::OP_UPSERT, nullptr, &OperationRunner::LookUpsert},
    {fileindex::OP_ATTR, nullptr, &OperationRunner::LookAttr},
    {fileindex::OP_UPDATE_CFG, nullptr, &OperationRunner::LookReindex},
    {fileindex::OP_RENAME, &OperationRunner::MoveRename, &OperationRunner::LookRename},
    {fileindex::OP_REINDEX, nullptr, &OperationRunner::LookReindex},
    {fileindex::OP_FULL_REINDEX, nullptr, &OperationRunner::LookFullReindex},
};

OperationRunner::OperationRunner(const PassContext& context)
    : context_(context), rules_(context.share, context.root), tasks_(context.pool, context.interruption) {}

void OperationRunner::Run(const std::function<void(const std::function<void(const fileindex::OP&)>&)>& each) {
  uint64_t operations = 0;
  each([&operations](const fileindex::OP&) { ++operations; });
  context_.status.BeginPass(operations);
  each([this](const fileindex::OP& op) { CarryOut(op, Stage::kMove); });
  tasks_.Wait();
  each([this](const fileindex::OP& op) {
    CarryOut(op, Stage::kLook);
    context_.status.OperationDone();
  });
  tasks_.Wait();
  Commit();
}

void OperationRunner::CarryOut(const fileindex::OP& op, Stage stage) {
  context_.interruption.Check();
  const std::string path = op.node->GetPath();
  const bool ours = path == context_.root || StringStartWith(path, context_.root + "/");
  if (!ours && op.op != fileindex::OP_FULL_REINDEX) {
    if (stage == Stage::kMove) {
      Log(LOG_WARNING, "queue of share %s: %s lies outside of it", context_.share.c_str(), path.c_str());
    }
    return;
  }
  for (const Handler& handler : kHandlers) {
    const Handler::Function function = stage == Stage::kMove ? handler.move : handler.look;
    if (handler.op == op.op && function != nullptr) (this->*function)(path, op.path);
  }
  CommitIfDue();
}

void OperationRunner::KeepWhatIsDone() noexcept {
  try {
    if (uncommitted_) Commit();
  } catch (const std::exception&) {
    // What is not committed is done again when the queue is taken up again.
  }
}

/// What has been written becomes searchable and safe while a long pass goes on.
void OperationRunner::CommitIfDue() {
  if (!uncommitted_ || std::chrono::steady_clock::now() - last_commit_ < kCommitInterval) return;
  Commit();
}

void OperationRunner::Commit() {
  uncommitted_ = false;
  context_.index.Commit();
  context_.status.Committed();
  last_commit_ = std::chrono::steady_clock::now();
}

void OperationRunner::MoveDelete(const std::string& path, const std::string&) {
  struct stat status = {};
  if (LookAt(path, status) != Presence::kGone) return;
  tasks_.Submit([this, path] { RemoveTree(path); });
}

/// The documents are moved only to spare reading the files again: both places are compared afterwards. Later renames
/// have carried the earlier ones along in the queue, which then no longer tells what happened (two folders that were
/// swapped, for example), and an earlier pass may have seen the disk as it is now.
void OperationRunner::MoveRename(const std::string& path, const std::string& old_path) {
  tasks_.Wait();
  const bool within = path != old_path && path != context_.root && StringStartWith(old_path, context_.root + "/");
  if (!within || !rules_.CanBeIndexed(path) || !rules_.CanBeIndexed(old_path)) return;
  if (!HoldsDocumentsOf(old_path, path)) return;
  uncommitted_ = true;
  try {
    context_.index.Rename(path, old_path);
  } catch (const Error& error) {
    if (error.Code() != Error::kEngineNoSuchDocument) throw;
  }
}

/// Whether what the index has at the old path is what is at the new one now. When that has gone on to yet another
/// place, a later rename will tell; the documents are its, unless there is something new at the old path.
bool OperationRunner::HoldsDocumentsOf(const std::string& old_path, const std::string& path) {
  using namespace KOVA::CONTENT_EXTRACT;  // NOLINT: its functions of stamps
  struct stat status = {};
  const auto indexed = context_.index.Find(old_path);
  if (indexed.empty()) return false;
  if (LookAt(path, status) == Presence::kThere) return SameFile(indexed.front().stamp, Stamp(status));
  return LookAt(old_path, status) == Presence::kGone;
}

/// What is there again is compared: of a file that a folder has replaced, the queue keeps the delete alone.
void OperationRunner::LookDelete(const std::string& path, const std::string&) {
  struct stat status = {};
  if (LookAt(path, status) != Presence::kGone) Compare(path);
}

void OperationRunner::LookRename(const std::string& path, const std::string& old_path) {
  if (path != context_.root && rules_.CanBeIndexed(path)) {
    tasks_.Submit([this, path, old_path] { RefreshRenamed(path, old_path); });
  }
  if (StringStartWith(old_path, context_.root + "/")) LookReindex(old_path, "");
  LookReindex(path, "");
}

void OperationRunner::LookUpsert(const std::string& path, const std::string&) {
  if (path == context_.root) return;
  const bool wanted = rules_.CanBeIndexed(path);
  tasks_.Submit([this, path, wanted] { wanted ? Write(path) : Remove(path); });
}

void OperationRunner::LookAttr(const std::string& path, const std::string&) {
  if (path == context_.root) return;
  if (!rules_.CanBeIndexed(path)) {
    tasks_.Submit([this, path] { Remove(path); });
  } else if (BecameReadable(path)) {
    Compare(path);
  } else {
    tasks_.Submit([this, path] { RefreshAttributes(path); });
  }
}

/// A folder that is copied leaves a reindex for each of its subfolders. All changes of this queue are older than its
/// first comparison, so what was compared once need not be again.
void OperationRunner::LookReindex(const std::string& path, const std::string&) {
  for (std::string folder = path; folder.size() >= context_.root.size(); folder = Dirname(folder)) {
    if (compared_.count(folder) != 0) return;
  }
  Compare(path);
  compared_.insert(path);
}

void OperationRunner::LookFullReindex(const std::string&, const std::string&) { Compare(context_.root); }

void OperationRunner::Write(const std::string& path) {
  struct stat status = {};
  if (LookAt(path, status) == Presence::kGone) return Remove(path);
  try {
    uncommitted_ = true;
    context_.index.Upsert(path, !S_ISDIR(status.st_mode));
    context_.status.DocumentsWritten(1);
  } catch (const Error& error) {
    RecordFailure(error, path);
  }
}

/// The attributes alone are refreshed when that cannot make an old content look like a new one.
void OperationRunner::RefreshAttributes(const std::string& path) {
  using KOVA::CONTENT_EXTRACT::SameContent;
  struct stat status = {};
  if (LookAt(path, status) == Presence::kGone) return Remove(path);
  const auto indexed = context_.index.Find(path);
  const bool same = !indexed.empty() && SameContent(indexed.front().stamp, KOVA::CONTENT_EXTRACT::Stamp(status));
  if (!same) return Write(path);
  try {
    uncommitted_ = true;
    context_.index.Attr(path);
    context_.status.DocumentsWritten(1);
  } catch (const Error& error) {
    if (error.Code() == Error::kEngineNoSuchDocument) return Write(path);
    RecordFailure(error, path);
  }
}

/// A rename changes the moved entry itself, and with another extension the way in which its content is read. When it
/// is gone already, a later operation knows its present place and still needs the document.
void OperationRunner::RefreshRenamed(const std::string& path, const std::string& old_path) {
  struct stat status = {};
  if (LookAt(path, status) != Presence::kThere) return;
  const bool same_kind = GetFileExtension(path, true) == GetFileExtension(old_path, true);
  same_kind ? RefreshAttributes(path) : Write(path);
}

/// Called while an error is handled: goes on when it is the file's, passes it on when it is the engine's.
void OperationRunner::RecordFailure(const Error& error, const std::string& path) {
  struct stat status = {};
  if (error.Code() == Error::kParseFailed) {
    if (LookAt(path, status) == Presence::kGone) return Remove(path);
    return context_.status.AddFailure("cannot be examined", path);
  }
  if (error.Code() != Error::kEngineBadRequest) throw;
  context_.status.AddFailure(error.what(), path);
}

void OperationRunner::Remove(const std::string& path) {
  uncommitted_ = true;
  context_.index.Delete(path);
  context_.status.DocumentsDeleted(1);
}

void OperationRunner::RemoveTree(const std::string& path) {
  Remove(path);
  context_.index.DeleteBelow(path);
}

/// Whether a folder can be read of which the index knows no content: its permissions may just have been opened.
bool OperationRunner::BecameReadable(const std::string& folder) {
  const UniqueFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  return opened.Valid() && context_.index.List(folder, "", 1).empty();
}

void OperationRunner::Compare(const std::string& path) {
  tasks_.Wait();
  if (path != context_.root) {
    if (!StringStartWith(path, context_.root + "/")) return;
    struct stat status = {};
    const Presence presence = LookAt(path, status);
    if (presence == Presence::kUnknown) {
      return context_.status.AddFailure(std::string("cannot be examined: ") + strerror(errno), path);
    }
    if (presence == Presence::kGone || !rules_.CanBeIndexed(path)) return RemoveTree(path);
    CompareOne(path, status);
    if (!S_ISDIR(status.st_mode)) return context_.index.DeleteBelow(path);
  }
  CompareFolder(path);
}

void OperationRunner::CompareOne(const std::string& path, const struct stat& status) {
  const auto indexed = context_.index.Find(path);
  if (!indexed.empty() && IsCurrent(indexed.front(), status)) return;
  tasks_.Submit([this, path] { Write(path); });
}

void OperationRunner::CompareFolder(const std::string& folder) {
  WalkRules walk_rules;
  walk_rules.skip_name = &PathRules::SkipName;
  walk_rules.may_enter = [this](const std::string& path, const struct stat& status, dev_t device) {
    return rules_.MayEnter(path, status, device);
  };
  walk_rules.on_problem = [this](const std::string& path, int error) {
    context_.status.AddFailure(std::string("cannot be read: ") + strerror(error), path);
  };
  TreeWalk walk(folder, walk_rules);
  FERROX_FAIL_IF(!walk.Opened() && folder == context_.root, Error::kInternal, "the share's folder cannot be read");

  context_.status.BeginComparison(folder);
  CompareBelow(folder, walk, context_.index, Actions(folder));
  tasks_.Wait();
  context_.status.LinksSkipped(walk.LinksSkipped());
  context_.status.EndComparison();
}

ComparisonActions OperationRunner::Actions(const std::string& folder) {
  ComparisonActions actions;
  actions.is_current = &IsCurrent;
  actions.write = [this](const std::string& path, const struct stat&) { tasks_.Submit([this, path] { Write(path); }); };
  actions.remove = [this](const std::string& path) { tasks_.Submit([this, path] { Remove(path); }); };
  const auto count = std::make_shared<std::unique_ptr<FileCount>>();
  actions.examined = [this, folder, count, examined = uint64_t{0}]() mutable {
    context_.interruption.Check();
    context_.status.FileExamined();
    if (++examined == kFilesBeforeCount) *count = std::make_unique<FileCount>(folder, context_.status);
    CommitIfDue();
  };
  return actions;
}

}  // namespace ferrox::indexd
