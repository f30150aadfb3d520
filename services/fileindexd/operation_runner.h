#pragma once

#include <functional>
#include <set>
#include <string>
#include <vector>

#include "fileindex/optree/optree.h"
#include "services/fileindexd/access_follower.h"
#include "services/fileindexd/anchors.h"
#include "services/fileindexd/change_follower.h"
#include "services/fileindexd/disk_stage.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/move_stage.h"
#include "services/fileindexd/pass_commits.h"
#include "services/fileindexd/pass_context.h"
#include "services/fileindexd/path_rules.h"

namespace ferrox::indexd {

/// Carries the operations of one pass into the index, in two stages: MoveStage removes and moves documents, in the
/// queue's order as far as they concern each other; then DiskStage compares documents with the disk, which is right
/// whatever came before, with files read beside each other. (The queue itself may hold a change of a file in front of
/// the rename that brought the file's old document to its place.) Each operation may be carried out again, for example
/// after a crash, and gives the same end. A single bad file is recorded and passed over. Belongs to the worker's
/// thread.
class OperationRunner {
 public:
  using TakeOperation = std::function<void(const fileindex::OP&)>;

  explicit OperationRunner(const PassContext& context);
  OperationRunner(const OperationRunner&) = delete;
  OperationRunner& operator=(const OperationRunner&) = delete;
  /// However the pass ends, its early writes are kept note of.
  ~OperationRunner();

  /// Carries out what `each` hands over (it is called several times and hands over the same each time), and compares
  /// the paths `also_compare`.
  /// @return after a durable commit. @throws Interrupted; Error when the index cannot be written: the pass is then to
  /// be tried again.
  void Run(const std::function<void(const TakeOperation&)>& each, const std::vector<std::string>& also_compare);
  /// Commits what has been done, as far as that works at once. For a pass that ends early.
  void KeepWhatIsDone() noexcept;

  /// Whether the queue held a reindex, which keeps the library from queuing what concerns the paths below it.
  bool HadReindex() const { return disk_.HadReindex(); }

 private:
  enum class Stage { kMove, kDisk };

  void CarryOut(const fileindex::OP& op, Stage stage);
  void AwaitOwner(const std::string& path, const std::string& old_path) const;
  void StopFollowers();

  PassContext context_;
  PathRules rules_;
  DocumentWriter writer_;
  const std::set<std::string> early_writes_before_;  ///< those of the pass before
  Anchors anchors_;
  ChangeFollower changes_;
  AccessFollower access_;
  PassCommits commits_;
  MoveStage moves_;
  DiskStage disk_;
};

}  // namespace ferrox::indexd
