#pragma once

#include <sys/stat.h>

#include <string>

#include "base/path_table.h"
#include "services/fileindexd/access_batch.h"
#include "services/fileindexd/comparison.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/pass_commits.h"
#include "services/fileindexd/pass_context.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/removal_batch.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// Brings the documents at and below a path in line with the disk: writes what is new or differs, and removes what is
/// gone, not indexed, or lies outside of the share; where the rights alone differ, records these. Folders are walked in
/// the caller's thread, files written by tasks; the figures go to the share's status. Belongs to the worker's thread.
class TreeComparer {
 public:
  /// All outlive it; `tasks`, which are those of `access`, may end its tasks afterwards: they do not use this object.
  TreeComparer(const PassContext& context, PathRules& rules, DocumentWriter& writer, PassCommits& commits,
               TaskGroup& tasks, AccessBatch& access);

  /// Compares what is at and below the path; nothing when it lies outside of the share. @throws Interrupted; Error.
  void Compare(const std::string& path);
  /// The same unless this pass has done it for the path or for a folder above it. A folder that is copied leaves a
  /// reindex for each of its subfolders; all changes of a pass's queue are older than the pass's first comparison.
  void CompareOnce(const std::string& path);

 private:
  void CompareRoot();
  void RemoveStrays();
  void CompareEntry(const std::string& path, PathRules::Place place, const struct stat& status);
  void CompareFolder(const std::string& folder);
  ComparisonActions Actions(const std::string& folder);

  const PassContext& context_;
  PathRules& rules_;
  DocumentWriter& writer_;
  PassCommits& commits_;
  TaskGroup& tasks_;
  AccessBatch& access_;
  RemovalBatch gone_;
  base::PathTable<bool> compared_;
};

}  // namespace ferrox::indexd
