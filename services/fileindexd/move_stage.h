#pragma once

#include <string>
#include <vector>

#include "fileindex/optree/optree.h"
#include "services/fileindexd/document_mover.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/pass_context.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/paths_under_way.h"
#include "services/fileindexd/removal_batch.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// The first stage of a pass: removes documents of what was deleted, and moves those of what was renamed, so that no
/// file has to be read again for it. Operations on paths that have nothing to do with each other run beside each other
/// as tasks; the others keep the queue's order. It reads the disk only to tell whether a document still describes what
/// is there; to bring documents in line with the disk is DiskStage's. Belongs to the worker's thread.
class MoveStage {
 public:
  /// All outlive it.
  MoveStage(const PassContext& context, PathRules& rules, DocumentWriter& writer);

  /// For the tasks from now on (TaskGroup).
  void SetUrgent(bool urgent) { tasks_.SetUrgent(urgent); }
  /// Deletes and renames; other operations are none of this stage. `old_path` is that of a rename.
  void CarryOut(fileindex::FileIndexOP op, const std::string& path, const std::string& old_path);
  /// Returns when all that was begun is done. @throws Interrupted; Error.
  void Finish();

  /// Whether a folder was moved or removed with all below it.
  bool ChangedFolder() const { return mover_.MovedFolder() || removed_folder_; }

  /// Moves the documents of folders among `differing`, those whose configuration has changed, that are indexed under
  /// another name now, as a user's renamed home is.
  void MoveRenamedFolders(const std::vector<std::string>& differing);
  /// Moves the documents of an earlier place of the share to its folder. @return whether there were any.
  bool MoveStrays();

 private:
  void Delete(const std::string& path);
  void Rename(const std::string& path, const std::string& old_path);
  void BeginOn(const std::vector<std::string>& paths);

  const PassContext& context_;
  DocumentMover mover_;
  PathsUnderWay under_way_;
  TaskGroup tasks_;
  RemovalBatch gone_trees_;
  int removed_ = 0;              ///< paths
  bool removed_folder_ = false;  ///< there were documents below one of these
};

}  // namespace ferrox::indexd
