#pragma once

#include <sys/stat.h>

#include <atomic>
#include <chrono>
#include <set>
#include <string>

#include "common/error.h"
#include "fileindex/optree.h"
#include "services/fileindexd/comparison.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_status.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// What one pass over a share's queue works with; all outlive it.
struct PassContext {
  const std::string& share;
  const std::string& root;  ///< the share's folder
  ShareIndex& index;
  TaskPool& pool;
  const Interruption& interruption;
  ShareStatus& status;
  /// The queue was begun before: its renames may have been carried out already, and what is at the old path now may be
  /// another file's document. They are compared instead.
  bool replay = false;
};

/// Carries the operations of one pass into the index, in their order as far as it shows: upserts run beside each other,
/// so do deletes, and everything else waits for what came before it. Each operation may be carried out again, for
/// example after a crash, and gives the same end. A single bad file is recorded and passed over.
class OperationRunner {
 public:
  explicit OperationRunner(const PassContext& context);

  /// @throws Interrupted; Error when the index cannot be written: the pass is then to be tried again.
  void Run(const fileindex::OP& op);
  /// Waits for all that is under way and commits it. @throws likewise.
  void Finish();
  /// Commits what has been done, as far as that works at once. For a pass that ends early.
  void KeepWhatIsDone() noexcept;

 private:
  enum class Phase { kWrites, kDeletes };
  struct Handler;
  static const Handler kHandlers[];

  void OnDelete(const std::string& path, const std::string& old_path);
  void OnUpsert(const std::string& path, const std::string& old_path);
  void OnAttr(const std::string& path, const std::string& old_path);
  void OnRename(const std::string& path, const std::string& old_path);
  void OnReindex(const std::string& path, const std::string& old_path);
  void OnFullReindex(const std::string& path, const std::string& old_path);

  void Enter(Phase phase);
  void CommitIfDue();
  void Commit();

  // Carried out by the pool's threads.
  void Write(const std::string& path);
  void RefreshAttributes(const std::string& path);
  void Remove(const std::string& path);
  void RemoveTree(const std::string& path);
  void RecordFailure(const Error& error, const std::string& path);

  bool MoveDocuments(const std::string& path, const std::string& old_path);
  void RefreshRenamed(const std::string& path, const std::string& old_path);
  bool BecameReadable(const std::string& folder);
  void Compare(const std::string& path);
  void CompareOne(const std::string& path, const struct stat& status);
  void CompareFolder(const std::string& folder);
  ComparisonActions Actions(const std::string& folder);

  PassContext context_;
  PathRules rules_;
  TaskGroup tasks_;
  Phase phase_ = Phase::kWrites;
  std::set<std::string> compared_;  ///< since the last rename
  std::atomic<bool> uncommitted_{false};
  std::chrono::steady_clock::time_point last_commit_ = std::chrono::steady_clock::now();
};

}  // namespace ferrox::indexd
