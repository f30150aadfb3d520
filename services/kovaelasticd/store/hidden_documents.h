#pragma once

#include <memory>
#include <string>

#include "base/mutex.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// The documents below folders that were deleted whole (FolderTree::TakeOut): they are in the tables until Clearing has
/// taken them out, but in nobody's answer. Each snapshot has a set of its own; it is made once and kept for the readers
/// of one file, which may call from any thread.
///
/// Folders are cleared in the order in which they were deleted, and numbers of documents are not given again. So the
/// name of the folder that was deleted last tells snapshots apart, and a set stays right while its documents go.
class HiddenDocuments {
 public:
  /// Those of the connection's snapshot; null when there are none. Walks through the folders that were deleted since
  /// the set was last made. @throws Error kEngineStorage.
  std::shared_ptr<const DocSet> Of(Database& database);

 private:
  base::Mutex mutex_;
  std::string newest_ BASE_GUARDED_BY(mutex_);  ///< the name of the folder deleted last, of set_
  std::shared_ptr<const DocSet> set_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
