#pragma once

#include <sys/stat.h>

#include <atomic>
#include <chrono>
#include <functional>
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
};

/// Carries the operations of one pass into the index, in two stages: first what removes and moves documents, in the
/// queue's order; then what looks at the disk, which is right whatever came before, files beside each other. (The queue
/// itself may hold a change of a file in front of the rename that brought the file's old document to its place.) Each
/// operation may be carried out again, for example after a crash, and gives the same end. A single bad file is recorded
/// and passed over.
class OperationRunner {
 public:
  explicit OperationRunner(const PassContext& context);

  /// Carries out what `each` hands over; it is called several times and hands over the same each time.
  /// @return after a durable commit. @throws Interrupted; Error when the index cannot be written: the pass is then to
  /// be tried again.
  void Run(const std::function<void(const std::function<void(const fileindex::OP&)>&)>& each);
  /// Commits what has been done, as far as that works at once. For a pass that ends early.
  void KeepWhatIsDone() noexcept;

 private:
  struct Handler;
  static const Handler kHandlers[];
  enum class Stage { kMove, kLook };

  void MoveDelete(const std::string& path, const std::string& old_path);
  void MoveRename(const std::string& path, const std::string& old_path);
  void LookDelete(const std::string& path, const std::string& old_path);
  void LookRename(const std::string& path, const std::string& old_path);
  void LookUpsert(const std::string& path, const std::string& old_path);
  void LookAttr(const std::string& path, const std::string& old_path);
  void LookReindex(const std::string& path, const std::string& old_path);
  void LookFullReindex(const std::string& path, const std::string& old_path);

  void CarryOut(const fileindex::OP& op, Stage stage);
  void CommitIfDue();
  void Commit();

  // Carried out by the pool's threads.
  void Write(const std::string& path);
  void RefreshAttributes(const std::string& path);
  void RefreshRenamed(const std::string& path, const std::string& old_path);
  void Remove(const std::string& path);
  void RemoveTree(const std::string& path);
  void RecordFailure(const Error& error, const std::string& path);

  bool HoldsDocumentsOf(const std::string& old_path, const std::string& path);
  bool BecameReadable(const std::string& folder);
  void Compare(const std::string& path);
  void CompareOne(const std::string& path, const struct stat& status);
  void CompareFolder(const std::string& folder);
  ComparisonActions Actions(const std::string& folder);

  PassContext context_;
  PathRules rules_;
  TaskGroup tasks_;
  std::set<std::string> compared_;
  std::atomic<bool> uncommitted_{false};
  std::chrono::steady_clock::time_point last_commit_ = std::chrono::steady_clock::now();
};

}  // namespace ferrox::indexd
