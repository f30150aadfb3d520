#pragma once

#include <sys/stat.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <set>
#include <string>
#include <vector>

#include "base/path_table.h"
#include "fileindex/optree/optree.h"
#include "services/fileindexd/change_follower.h"
#include "services/fileindexd/comparison.h"
#include "services/fileindexd/document_mover.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/paths_under_way.h"
#include "services/fileindexd/removal_batch.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_place.h"
#include "services/fileindexd/share_status.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// What one pass over a share's queue works with; all outlive it.
struct PassContext {
  const std::string& share;
  const std::string& root;  ///< the share's folder
  const ShareFolders& folders;
  ShareIndex& index;
  TaskPool& pool;
  const Interruption& interruption;
  ShareStatus& status;
  const HeldFolder& held;  ///< the share's folder
  const std::string& queue_path;
  std::chrono::milliseconds early_write_interval;
  /// Numbers of files that changed under names that tell nothing of the share's own.
  const std::set<uint64_t>& changed_files;
  /// Whether the index may hold documents of an earlier place of the share.
  bool may_hold_strays;
  /// The folders that the index was last brought in line with.
  const ShareFolders& applied;
  /// Returns when the folders stay as they are although a change of them is to be expected. @throws Interrupted when
  /// they have changed, so that the pass begins anew.
  std::function<void()> await_folders;
  /// Files that a pass wrote ahead of the pass that has their lines, which looks at them again. Kept by the worker.
  std::set<std::string>& early_writes;
};

/// Carries the operations of one pass into the index, in two stages: first what removes and moves documents, in the
/// queue's order as far as they concern each other; then what looks at the disk, which is right whatever came before,
/// files beside each other. (The queue itself may hold a change of a file in front of the rename that brought the
/// file's old document to its place.) Each operation may be carried out again, for example after a crash, and gives the
/// same end. A single bad file is recorded and passed over.
class OperationRunner {
 public:
  explicit OperationRunner(const PassContext& context);
  OperationRunner(const OperationRunner&) = delete;
  OperationRunner& operator=(const OperationRunner&) = delete;
  ~OperationRunner();

  /// Carries out what `each` hands over (it is called several times and hands over the same each time), and compares
  /// the paths `also_compare`.
  /// @return after a durable commit. @throws Interrupted; Error when the index cannot be written: the pass is then to
  /// be tried again.
  void Run(const std::function<void(const std::function<void(const fileindex::OP&)>&)>& each,
           const std::vector<std::string>& also_compare);
  /// Commits what has been done, as far as that works at once. For a pass that ends early.
  void KeepWhatIsDone() noexcept;

  /// @throws Error kPathNotIndexable when the share's folder is not the one any more at which the pass began: what was
  /// not found may be anywhere.
  void CheckRoot() const;

  /// Whether the queue held a reindex, which keeps the library from queuing what concerns the paths below it.
  bool HadReindex() const { return had_reindex_; }

 private:
  using Place = PathRules::Place;
  using ListPage = std::function<std::vector<IndexedEntry>(const std::string& after, unsigned limit)>;
  struct Handler;
  static const Handler kHandlers[];
  enum class Stage { kMove, kLook };

  void MoveDelete(const std::string& path, const std::string& old_path);
  void MoveRename(const std::string& path, const std::string& old_path);
  void LookDelete(const std::string& path, const std::string& old_path);
  void LookRename(const std::string& path, const std::string& old_path);
  void LookUpsert(const std::string& path, const std::string& old_path);
  void LookAttr(const std::string& path, const std::string& old_path);
  void LookUpdateCfg(const std::string& path, const std::string& old_path);
  void LookReindex(const std::string& path, const std::string& old_path);
  void LookFullReindex(const std::string& path, const std::string& old_path);

  void AwaitOwner(const std::string& path, const std::string& old_path) const;
  void CarryOut(const fileindex::OP& op, Stage stage);
  bool TakeStraysAlong();
  void TakeFoldersAlong(const std::vector<std::string>& differing);
  void BeginMove(const std::vector<std::string>& paths);
  void FinishMoves();
  void CommitIfDue();
  void StopFollowing();
  void RecheckEarlyWrites();
  void Commit();

  bool BecameReadable(const std::string& folder);
  void CompareOnce(const std::string& path);
  void Compare(const std::string& path);
  void CompareRoot();
  void RemoveStrays();
  void RefreshChangedFiles();
  void RefreshSuspects();
  void RefreshPages(const ListPage& list, const std::function<bool(const IndexedEntry&)>& leave);
  void RemoveTree(const std::string& path);
  void RemoveBelow(const std::string& folder);
  void CompareOne(const std::string& path, Place place, const struct stat& status);
  void CompareFolder(const std::string& folder);
  ComparisonActions Actions(const std::string& folder);

  PassContext context_;
  PathRules rules_;
  DocumentWriter writer_;
  DocumentMover mover_;
  TaskGroup tasks_;
  PathsUnderWay under_way_;
  RemovalBatch gone_trees_;
  RemovalBatch gone_;
  const std::set<std::string> early_writes_before_;  ///< written ahead of this pass
  base::PathTable<bool> compared_;
  bool had_reindex_ = false;
  std::chrono::steady_clock::time_point last_commit_ = std::chrono::steady_clock::now();
  ChangeFollower follower_;
};

}  // namespace ferrox::indexd
