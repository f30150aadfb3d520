#pragma once

#include <sys/stat.h>

#include <set>
#include <string>

#include "fileindex/optree/optree.h"
#include "services/fileindexd/access_batch.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/pass_commits.h"
#include "services/fileindexd/pass_context.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/task_pool.h"
#include "services/fileindexd/tree_comparer.h"

namespace ferrox::indexd {

/// The second stage of a pass: brings the documents of all paths that the operations name in line with the disk as it
/// is now. Single files are written by tasks beside each other; what may hold more than a file is compared
/// (TreeComparer). Belongs to the worker's thread.
class DiskStage {
 public:
  /// All outlive it.
  DiskStage(const PassContext& context, PathRules& rules, DocumentWriter& writer, PassCommits& commits);

  /// For the tasks from now on (TaskGroup), until a folder is compared.
  void SetUrgent(bool urgent) { tasks_.SetUrgent(urgent); }
  /// `old_path` is that of a rename.
  void CarryOut(fileindex::FileIndexOP op, const std::string& path, const std::string& old_path);
  /// Compares what is at and below the path, unless that was done in this pass (TreeComparer).
  void CompareOnce(const std::string& path) { comparer_.CompareOnce(path); }
  /// Returns when all that was begun is done. @throws Interrupted; Error.
  void Wait() { access_.Finish(); }

  /// Removes the documents of those files that an earlier pass wrote early and that are gone: folding drops the delete
  /// of a file where the folder that it was in is a file now, since nothing in that folder could have been indexed, if
  /// it were not for the early write.
  void RecheckEarlyWrites(const std::set<std::string>& early_writes);
  /// Refreshes documents of files with several names that changed under another name than theirs.
  void RefreshLinked();

  /// Whether there was a reindex among the operations.
  bool HadReindex() const { return had_reindex_; }

 private:
  struct Handler;
  static const Handler kHandlers[];

  void Delete(const std::string& path, const std::string& old_path);
  void Upsert(const std::string& path, const std::string& old_path);
  void Attr(const std::string& path, const std::string& old_path);
  void UpdateCfg(const std::string& path, const std::string& old_path);
  void Rename(const std::string& path, const std::string& old_path);
  void Reindex(const std::string& path, const std::string& old_path);
  void FullReindex(const std::string& path, const std::string& old_path);
  void FollowIgnoreFile(const std::string& path);
  static bool HasIgnoreFile(const std::string& folder);
  bool BecameReadable(const std::string& folder) const;

  const PassContext& context_;
  PathRules& rules_;
  DocumentWriter& writer_;
  PassCommits& commits_;
  const bool reads_all_folders_;
  bool had_reindex_ = false;
  TaskGroup tasks_;
  AccessBatch access_;
  TreeComparer comparer_;
};

}  // namespace ferrox::indexd
