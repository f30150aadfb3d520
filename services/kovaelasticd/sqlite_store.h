#pragma once

#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "services/kovaelasticd/document.h"
#include "services/kovaelasticd/file_links.h"
#include "services/kovaelasticd/index_store.h"
#include "services/kovaelasticd/schema.h"
#include "services/kovaelasticd/sqlite_db.h"
#include "services/kovaelasticd/store_rows.h"
#include "services/kovaelasticd/text_codec.h"

namespace ferrox::engine {

/// One connection that reads, and what it needs to understand what it reads.
struct StoreReader {
  explicit StoreReader(const std::string& path);
  Database database;
  FieldNames names;
  TextCodec codec;
};

/// An index in one SQLite file (docs/formats/engine.md lists its tables). Texts go to the full-text tables when the
/// changes are committed or have grown large, in the order of the documents' numbers.
class SqliteStore : public IndexStore {
 public:
  /// Opens the file, or makes it with `create` when it is missing.
  SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema);
  ~SqliteStore() override;

  void Upsert(const std::string& path, const Json::Value& document) override;
  void Set(const std::string& path, const Json::Value& changes) override;
  void Delete(const std::string& path) override;
  void DeletePrefix(const std::string& prefix) override;
  void Get(const GetRequest& request, const std::function<void(const Json::Value&)>& take) override;
  void Commit() override;
  void Rollback() override;
  int64_t UncommittedBytes() const override { return uncommitted_bytes_; }
  void RebuildSuggestions() override;
  SearchReply Search(const SearchRequest& request) override;
  StoreStat Stat() override;

  /// The largest size of the file, in pages; for tests of a full disk. 0: no limit.
  void LimitPages(int64_t pages);

 private:
  /// A document whose words in the full-text tables are not yet what they must be.
  struct Pending {
    std::optional<MetaText> old_meta;  ///< as the full-text table has it; none: it is not in there
    std::optional<MetaText> new_meta;
    bool text_changed = false;
    std::optional<std::string> text;
  };
  void MakeTables();
  void CheckFormat();
  void Begin();
  void ShortenLog();
  void AddFieldNames(const Json::Value& document);

  Pending& Touch(const StoredDocument& stored);
  int64_t InsertRow(const DocRow& row, int64_t text_bytes);
  void UpdateRow(int64_t id, const DocRow& row, int64_t text_bytes);
  void Remove(const StoredDocument& stored);
  void MoveAway(const std::string& path);
  void CountText(int64_t before, int64_t after);
  void Changed(int64_t bytes);

  void Flush();
  void FlushText(int64_t id, const Pending& pending);
  void FlushMeta(int64_t id, const Pending& pending);
  void WriteMeta(int64_t id, const MetaText& meta, bool remove);
  std::string StoredText(int64_t id);
  Json::Value LoadEntry(const StoredDocument& stored, const std::vector<std::string>& fields);

  std::unique_ptr<StoreReader> BorrowReader();
  void ReturnReader(std::unique_ptr<StoreReader> reader);

  std::shared_ptr<const Schema> schema_;
  Database writer_;
  TextCodec codec_;
  FieldNames names_;
  FileLinks links_{writer_, names_};
  Totals totals_;
  std::map<int64_t, Pending> pending_;
  int64_t pending_bytes_ = 0;
  int64_t last_flushed_ = 0;  ///< the id that went into the full-text tables last
  int64_t uncommitted_bytes_ = 0;
  bool in_transaction_ = false;

  base::Mutex readers_mutex_;
  std::vector<std::unique_ptr<StoreReader>> readers_ BASE_GUARDED_BY(readers_mutex_);
};

}  // namespace ferrox::engine
