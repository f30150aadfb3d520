#include "services/fileindexd/operation_runner.h"

#include <fcntl.h>
#include <limits.h>
#include <syslog.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "base/path.h"
#include "base/unique_fd.h"
#include "common/error.h"
#include "common/log.h"
#include "services/fileindexd/file_count.h"
#include "services/fileindexd/queue_tail.h"
#include "services/fileindexd/stray_documents.h"

namespace ferrox::indexd {

namespace {

using fileindex::FileIndexOP;

constexpr auto kCommitInterval = std::chrono::seconds(5);
/// A comparison that takes longer tells how many files there are.
constexpr auto kTimeBeforeCount = std::chrono::milliseconds(300);
constexpr unsigned kRemovedAtOnce = 1000;
/// So few changes are what somebody is waiting for, rather than a folder that is copied.
constexpr uint64_t kUrgentOperations = 4;
/// So many folders, and places that hold documents, are looked through for what has moved.
constexpr size_t kTakenAlongMax = 100;

/// Whether nothing can be indexed there: a walk leaves out what has such a path.
bool IsTooLong(const std::string& path) { return path.size() >= PATH_MAX; }

}  // namespace

struct OperationRunner::Handler {
  using Function = void (OperationRunner::*)(const std::string& path, const std::string& old_path);
  FileIndexOP op;
  Function move;
  Function look;
};

constexpr OperationRunner::Handler OperationRunner::kHandlers[] = {
    {fileindex::OP_DELETE, &OperationRunner::MoveDelete, &OperationRunner::LookDelete},
    {fileindex::OP_UPSERT, nullptr, &OperationRunner::LookUpsert},
    {fileindex::OP_ATTR, nullptr, &OperationRunner::LookAttr},
    {fileindex::OP_UPDATE_CFG, nullptr, &OperationRunner::LookUpdateCfg},
    {fileindex::OP_RENAME, &OperationRunner::MoveRename, &OperationRunner::LookRename},
    {fileindex::OP_REINDEX, nullptr, &OperationRunner::LookReindex},
    {fileindex::OP_FULL_REINDEX, nullptr, &OperationRunner::LookFullReindex},
};

OperationRunner::OperationRunner(const PassContext& context)
    : context_(context),
      rules_(context.share, context.root, context.folders),
      writer_(context.index, context.folders, context.status),
      mover_(context_.root, context.index, context.folders, rules_, writer_, context.interruption),
      tasks_(context.pool, context.interruption),
      gone_trees_(tasks_, writer_, true),
      gone_(tasks_, writer_, false),
      early_writes_before_(context_.early_writes),
      follower_({context_.share, context_.root, context_.folders, context_.queue_path, writer_, context_.pool,
                 context_.interruption, context_.early_write_interval}) {}

/// What was written ahead is there, however the pass ends.
OperationRunner::~OperationRunner() { StopFollowing(); }

void OperationRunner::Run(const std::function<void(const std::function<void(const fileindex::OP&)>&)>& each,
                          const std::vector<std::string>& also_compare) {
  uint64_t operations = 0;
  each([&operations](const fileindex::OP&) { ++operations; });
  context_.status.BeginPass(operations);
  tasks_.SetUrgent(operations <= kUrgentOperations);
  each([this](const fileindex::OP& op) { CarryOut(op, Stage::kMove); });
  FinishMoves();
  TakeFoldersAlong(also_compare);
  const bool took_along = context_.may_hold_strays && TakeStraysAlong();
  follower_.Start();
  each([this](const fileindex::OP& op) {
    CarryOut(op, Stage::kLook);
    context_.status.OperationDone();
  });
  for (const std::string& path : also_compare) CompareOnce(path);
  if (took_along) CompareOnce(context_.root);
  tasks_.Wait();
  StopFollowing();
  follower_.ThrowIfFailed();
  RecheckEarlyWrites();
  RefreshChangedFiles();
  RefreshSuspects();
  Commit();
}

void OperationRunner::CarryOut(const fileindex::OP& op, Stage stage) {
  context_.interruption.Check();
  const std::string path = op.node->GetPath();
  const bool ours = base::IsAtOrBelow(path, context_.root);
  if (!ours && op.op != fileindex::OP_FULL_REINDEX) {
    if (stage == Stage::kMove) {
      Log(LOG_WARNING, "queue of share %s: %s lies outside of it", context_.share.c_str(), path.c_str());
    }
    return;
  }
  if (IsTooLong(path)) {
    // What was moved there has left the index; all else there was never in it.
    if (stage == Stage::kLook && op.op == fileindex::OP_RENAME) CompareOnce(op.path);
    return;
  }
  // Whoever watches this share is told of what happens in those that lie in it, too.
  const bool is_inner = context_.folders.IsInInner(path);
  if (is_inner && (op.op != fileindex::OP_RENAME || context_.folders.IsInInner(op.path))) return;
  if (op.op == fileindex::OP_RENAME && stage == Stage::kMove) AwaitOwner(path, op.path);
  for (const Handler& handler : kHandlers) {
    const Handler::Function function = stage == Stage::kMove ? handler.move : handler.look;
    if (handler.op == op.op && function != nullptr) (this->*function)(path, op.path);
  }
  CommitIfDue();
}

/// Whoever renames a share that lies in this one says a moment later where it is now. Its files are not read meanwhile.
void OperationRunner::AwaitOwner(const std::string& path, const std::string& old_path) const {
  const bool was_inner = context_.folders.Inner().count(old_path) != 0 || context_.applied.Inner().count(old_path) != 0;
  if (was_inner && !context_.folders.IsInInner(path)) context_.await_folders();
}

void OperationRunner::KeepWhatIsDone() noexcept {
  try {
    if (writer_.HasUncommitted()) Commit();
  } catch (const std::exception&) {
    // What is not committed is done again when the queue is taken up again.
  }
}

void OperationRunner::CheckRoot() const {
  FERROX_FAIL_IF(!context_.held.IsStillThere(), Error::kPathNotIndexable,
                 "the share's folder was unmounted or replaced while it was looked at; it is looked at again");
}

/// What has been written becomes searchable and safe while a long pass goes on.
void OperationRunner::CommitIfDue() {
  follower_.ThrowIfFailed();
  if (!writer_.HasUncommitted() || std::chrono::steady_clock::now() - last_commit_ < kCommitInterval) return;
  Commit();
}

/// Folding drops the delete of a file where the folder that it was in is a file now, since nothing in that folder could
/// have been indexed, if it were not for this.
void OperationRunner::RecheckEarlyWrites() {
  struct stat status = {};
  for (const std::string& path : early_writes_before_) {
    if (LookAt(path, status) == Presence::kGone) gone_.Add(path);
  }
  gone_.Flush();
  context_.early_writes = follower_.EarlyWrites();
}

void OperationRunner::StopFollowing() {
  follower_.Stop();
  context_.early_writes.insert(follower_.EarlyWrites().begin(), follower_.EarlyWrites().end());
}

void OperationRunner::Commit() {
  writer_.Commit();
  last_commit_ = std::chrono::steady_clock::now();
}

void OperationRunner::MoveDelete(const std::string& path, const std::string&) {
  struct stat status = {};
  if (LookAt(path, status) != Presence::kGone) return;
  BeginMove({path});
  gone_trees_.Add(path);
}

void OperationRunner::MoveRename(const std::string& path, const std::string& old_path) {
  BeginMove({path, old_path});
  for (const DocumentMover::Step& step : mover_.StepsOf(path, old_path)) {
    tasks_.Submit([this, step] { mover_.Move(step); });
  }
}

/// A share that was renamed or moved is watched, and so compared, at its new place by whoever is first to see it there,
/// perhaps before the event of the move is queued, or in its place: what moves no documents would have every file read
/// again.
bool OperationRunner::TakeStraysAlong() {
  std::vector<std::string> seen = {context_.root};
  bool any = false;
  for (std::string stray; seen.size() < kTakenAlongMax && !(stray = FindStray(context_.index, seen)).empty();) {
    seen.push_back(TopOutside(stray, context_.root));
    const std::string before = mover_.RootBeforeMove(seen.back());
    if (before.empty()) continue;
    MoveRename(context_.root, before);
    FinishMoves();
    any = true;
  }
  return any;
}

/// So it is with a folder that is indexed under another name now, as a user's renamed home.
void OperationRunner::TakeFoldersAlong(const std::vector<std::string>& differing) {
  std::vector<std::pair<std::string, struct stat>> there;
  std::vector<std::string> others;
  for (const std::string& folder : differing) {
    struct stat status = {};
    if (context_.folders.PlaceOf(folder) != Place::kIndexed) {
      others.push_back(folder);
    } else if (LookAt(folder, status) == Presence::kThere) {
      there.emplace_back(folder, status);
    }
  }
  if (there.size() > kTakenAlongMax || others.size() > kTakenAlongMax) return;
  for (const std::string& other : others) {
    for (const auto& [folder, status] : there) {
      if (mover_.DescribesFile(other, status)) MoveRename(folder, other);
    }
  }
  FinishMoves();
}

/// What concerns other paths than all that is under way may be done beside it; else the queue's order counts.
void OperationRunner::BeginMove(const std::vector<std::string>& paths) {
  constexpr size_t kUnderWayMax = 10000;
  bool free = under_way_.Count() < kUnderWayMax;
  for (const std::string& path : paths) free = free && !under_way_.Touch(path);
  if (!free) FinishMoves();
  for (const std::string& path : paths) under_way_.Add(path);
}

void OperationRunner::FinishMoves() {
  gone_trees_.Flush();
  tasks_.Wait();
  under_way_.Clear();
}

/// What is there again is compared: of a file that a folder has replaced, the queue keeps the delete alone. A reindex
/// that came behind it is gone from the queue, too.
void OperationRunner::LookDelete(const std::string& path, const std::string&) {
  struct stat status = {};
  if (LookAt(path, status) == Presence::kGone) return;
  had_reindex_ = true;
  Compare(path);
}

/// Of a file, all that a comparison would do at its new place is done beside other files.
void OperationRunner::LookRename(const std::string& path, const std::string& old_path) {
  struct stat status = {};
  const bool wanted = path != context_.root && rules_.CanBeIndexed(path);
  const bool is_file = wanted && LookAt(path, status) == Presence::kThere && !S_ISDIR(status.st_mode);
  if (wanted) tasks_.Submit([this, path, old_path] { writer_.RefreshRenamed(path, old_path); });
  if (base::IsBelow(old_path, context_.root)) CompareOnce(old_path);
  if (is_file) {
    tasks_.Submit([this, path] { RemoveBelow(path); });
  } else {
    CompareOnce(path);
  }
}

void OperationRunner::LookUpsert(const std::string& path, const std::string&) {
  if (path == context_.root) return;
  const bool wanted = rules_.CanBeIndexed(path);
  tasks_.Submit([this, path, wanted] { wanted ? writer_.Write(path) : writer_.Remove(path); });
}

void OperationRunner::LookAttr(const std::string& path, const std::string&) {
  if (path == context_.root) return;
  const Place place = rules_.PlaceOf(path);
  if (place == Place::kOutside) {
    tasks_.Submit([this, path] { writer_.Remove(path); });
  } else if (BecameReadable(path)) {
    Compare(path);
  } else if (place == Place::kIndexed) {
    tasks_.Submit([this, path] { writer_.RefreshAttributes(path); });
  }
}

/// The kinds that the operation names are of no use: documents tell which content they hold, so that only those differ
/// whose kind was switched, also after a change whose event was lost.
void OperationRunner::LookUpdateCfg(const std::string& path, const std::string&) { CompareOnce(path); }

void OperationRunner::LookReindex(const std::string& path, const std::string&) {
  had_reindex_ = true;
  CompareOnce(path);
}

void OperationRunner::LookFullReindex(const std::string&, const std::string&) {
  had_reindex_ = true;
  Compare(context_.root);
}

/// Whether a folder can be read of which the index knows no content: its permissions may just have been opened.
bool OperationRunner::BecameReadable(const std::string& folder) {
  const base::UniqueFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  return opened.Valid() && context_.index.List(folder, "", 1).empty();
}

/// A folder that is copied leaves a reindex for each of its subfolders. All changes of this queue are older than its
/// first comparison, so what was compared once need not be again.
void OperationRunner::CompareOnce(const std::string& path) {
  if (IsTooLong(path) || compared_.HasAtOrAbove(path)) return;
  Compare(path);
  compared_.Insert(path, true);
}

void OperationRunner::Compare(const std::string& path) {
  if (path == context_.root) return CompareRoot();
  if (!base::IsBelow(path, context_.root)) return;
  const auto remove_tree = [this, path] { RemoveTree(path); };
  if (context_.folders.PlaceOf(path) == Place::kOutside) return tasks_.Submit(remove_tree);
  struct stat status = {};
  const Presence presence = LookAt(path, status);
  if (presence == Presence::kUnknown) {
    return context_.status.AddFailure(std::string("cannot be examined: ") + strerror(errno), path);
  }
  const Place place = rules_.PlaceOf(path);
  if (presence == Presence::kGone || place == Place::kOutside) return tasks_.Submit(remove_tree);
  tasks_.Wait();
  CompareOne(path, place, status);
  S_ISDIR(status.st_mode) ? CompareFolder(path) : RemoveBelow(path);
}

/// Of a change under a name that is outside of the share, or is gone, only the file's number is told.
void OperationRunner::RefreshChangedFiles() {
  if (context_.changed_files.size() > kChangedNumbersMax) return;  // all is compared
  const auto is_current = [this](const IndexedEntry& entry) {
    struct stat status = {};
    return LookAt(entry.path, status) == Presence::kThere && writer_.IsCurrent(entry, status);
  };
  for (const uint64_t file : context_.changed_files) {
    RefreshPages([&](const std::string& after, unsigned limit) { return context_.index.OfFile(file, after, limit); },
                 is_current);
  }
}

/// A file with several names is told of under one of them.
void OperationRunner::RefreshSuspects() {
  RefreshPages([this](const std::string& after, unsigned limit) { return context_.index.Suspects(after, limit); },
               [](const IndexedEntry&) { return false; });
}

/// Once through them: what cannot be refreshed stays.
void OperationRunner::RefreshPages(const ListPage& list, const std::function<bool(const IndexedEntry&)>& leave) {
  constexpr unsigned kPage = 1000;
  std::string after;
  for (size_t found = kPage; found == kPage;) {
    context_.interruption.Check();
    const std::vector<IndexedEntry> page = list(after, kPage);
    for (const IndexedEntry& entry : page) {
      if (!leave(entry)) tasks_.Submit([this, path = entry.path] { writer_.RefreshAttributes(path); });
    }
    tasks_.Wait();
    CommitIfDue();
    found = page.size();
    if (found > 0) after = page.back().path;
  }
}

void OperationRunner::RemoveTree(const std::string& path) {
  writer_.Remove(path);
  RemoveBelow(path);
}

/// Page by page: the index removes all at once, but cannot be interrupted then. From any thread.
void OperationRunner::RemoveBelow(const std::string& folder) {
  for (bool more = true; more;) {
    context_.interruption.Check();
    std::vector<std::string> paths;
    for (IndexedEntry& entry : context_.index.List(folder, "", kRemovedAtOnce)) paths.push_back(std::move(entry.path));
    more = paths.size() == kRemovedAtOnce;
    if (!paths.empty()) writer_.Remove(paths, false);
  }
}

void OperationRunner::CompareRoot() {
  tasks_.Wait();
  RemoveStrays();
  CompareFolder(context_.root);
}

/// After the share was renamed or moved, what could not be taken along is left behind under the old name.
void OperationRunner::RemoveStrays() {
  for (std::string stray; !(stray = FindStray(context_.index, {context_.root})).empty();) {
    context_.interruption.Check();
    RemoveTree(TopOutside(stray, context_.root));
  }
}

void OperationRunner::CompareOne(const std::string& path, Place place, const struct stat& status) {
  const auto indexed = context_.index.Find(path);
  if (place == Place::kOnTheWay) {
    if (!indexed.empty()) writer_.Remove(path);
  } else if (indexed.empty() || !writer_.IsCurrent(indexed.front(), status)) {
    tasks_.Submit([this, path] { writer_.Write(path); });
  }
}

void OperationRunner::CompareFolder(const std::string& folder) {
  WalkRules walk_rules;
  walk_rules.place_of = [this](const std::string& path) { return context_.folders.PlaceOf(path); };
  walk_rules.skip_name = &PathRules::SkipName;
  walk_rules.may_enter = [this](const std::string& path, const struct stat& status, dev_t device) {
    return rules_.MayEnter(path, status, device);
  };
  walk_rules.on_problem = [this](const std::string& path, int error) {
    context_.status.AddFailure(std::string("cannot be read: ") + strerror(error), path);
  };
  TreeWalk walk(folder, walk_rules);
  FERROX_FAIL_IF(!walk.Opened() && folder == context_.root, Error::kInternal, "the share's folder cannot be read");
  CheckRoot();

  tasks_.SetUrgent(false);
  context_.status.BeginComparison(folder);
  CompareBelow(folder, walk, context_.index, Actions(folder));
  gone_.Flush();
  tasks_.Wait();
  context_.status.LinksSkipped(walk.LinksSkipped());
  context_.status.EndComparison();
}

ComparisonActions OperationRunner::Actions(const std::string& folder) {
  ComparisonActions actions;
  actions.is_current = [this](const IndexedEntry& indexed, const struct stat& status) {
    const bool current = writer_.IsCurrent(indexed, status);
    if (current) context_.status.FileExamined();
    return current;
  };
  actions.write = [this](const std::string& path, const struct stat&) {
    tasks_.Submit([this, path] {
      writer_.Write(path);
      context_.status.FileExamined();
    });
  };
  actions.remove = [this](const std::string& path) { gone_.Add(path); };
  const auto count = std::make_shared<std::unique_ptr<FileCount>>();
  const auto count_at = std::chrono::steady_clock::now() + kTimeBeforeCount;
  actions.examine = [this, folder, count, count_at] {
    context_.interruption.Check();
    if (*count == nullptr && std::chrono::steady_clock::now() >= count_at)
      *count = std::make_unique<FileCount>(folder, context_.folders, context_.status);
    CommitIfDue();
  };
  return actions;
}

}  // namespace ferrox::indexd
