#pragma once

#include <memory>

#include "services/kovaelasticd/store/asker.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/readable_documents.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// What each user may read in one index, kept from search to search. All indices of the process together keep at most
/// kKeptMaxBytes; the set that was not used for the longest goes first. Any thread may call any member.
class ReadableCache {
 public:
  static constexpr size_t kKeptMaxBytes = size_t{32} << 20;

  ReadableCache() = default;
  ReadableCache(const ReadableCache&) = delete;
  ReadableCache& operator=(const ReadableCache&) = delete;
  ~ReadableCache() { GiveBack(); }

  /// Of the snapshot that `database` has a transaction on and `places` is of; `tree` is the connection's. Two threads
  /// that ask for one user at once both make it. @throws Error kEngineStorage.
  std::shared_ptr<const ReadableDocuments> Load(Database& database, FolderTree& tree, const Places& places,
                                                const Asker& asker);
  /// Drops what is kept of this index.
  void GiveBack();
};

}  // namespace ferrox::engine
