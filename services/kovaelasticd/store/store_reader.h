#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/hidden_documents.h"
#include "services/kovaelasticd/store/older_format.h"
#include "services/kovaelasticd/store/places_cache.h"
#include "services/kovaelasticd/store/readable_cache.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/text_codec.h"
#include "services/kovaelasticd/store/word_list_cache.h"

namespace ferrox::engine {

/// A connection that only reads, also a file of an older format, with what is needed to understand its rows. For one
/// thread at a time.
struct StoreReader {
  /// What is shared with other readers, of the same file, must outlive this.
  StoreReader(const std::string& path, HiddenDocuments& hidden_documents, PlacesCache& shared_places,
              ReadableCache& shared_readable, WordListCache& shared_words);
  /// To be called at the beginning of each transaction: learns what was committed since the last one.
  void Refresh();

  Database database;
  FieldNames names;
  FolderTree tree{database, PrepareOlderFormat(database)};
  TextCodec codec;
  /// Documents that are deleted but still in the tables; null when there are none.
  std::shared_ptr<const DocSet> hidden;
  PlacesCache& places;  ///< of all readers of the index, as are the next two
  ReadableCache& readable;
  WordListCache& words;

 private:
  HiddenDocuments& hidden_documents_;
  int64_t seen_version_ = -1;  ///< of the database, at the last Refresh
};

/// The reading connections of one index. A new one has to read the schema and to prepare each statement again, so a few
/// are kept for the next searches. Any thread may call any member.
class ReaderPool {
 public:
  /// `path` is the index file.
  explicit ReaderPool(std::string path) : path_(std::move(path)) {}

  /// An idle connection, or a new one: a search never waits for another. It keeps to the calling thread's WorkLimit.
  /// @throws Error kEngineStorage, IndexDamaged.
  std::unique_ptr<StoreReader> Borrow();
  /// Takes a connection back that has no transaction open. After a failure do not return it: it is closed then.
  void Return(std::unique_ptr<StoreReader> reader);
  // What PlacesCache says, for all that searches have in memory.
  std::optional<PlacesCache::SteadyClock::time_point> NextGiveBack() const;
  void GiveBack(PlacesCache::SteadyClock::time_point now);

 private:
  const std::string path_;
  HiddenDocuments hidden_documents_;
  PlacesCache places_;
  ReadableCache readable_;
  WordListCache words_;
  base::Mutex mutex_;
  std::vector<std::unique_ptr<StoreReader>> idle_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::engine
