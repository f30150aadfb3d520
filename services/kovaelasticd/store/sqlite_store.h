#pragma once

#include <memory>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/access_records.h"
#include "services/kovaelasticd/store/clearing.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/file_links.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/listed_documents.h"
#include "services/kovaelasticd/store/place_writer.h"
#include "services/kovaelasticd/store/row_watch.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/text_writer.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// An index in one SQLite file (docs/formats/engine.md lists its tables). One connection writes: rows of "docs" at
/// once, words through a TextWriter when the changes are committed or have grown large. Searches use connections of
/// their own (ReaderPool) in SQLite's write-ahead mode: each sees the last commit as it began, and none waits for a
/// writer.
class SqliteStore : public IndexStore {
 public:
  /// Opens the file, or makes it with `create` when it is missing.
  SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema);
  ~SqliteStore() override;

  void Upsert(const std::string& path, const Json::Value& document) override;
  void Set(const std::string& path, const Json::Value& changes) override;
  void MoveFolder(const std::string& path, const std::string& stamp, const Json::Value& changes) override;
  AccessReport SetAccess(const std::vector<AccessChange>& changes) override;
  void Delete(const std::string& path) override;
  void DeletePrefix(const std::string& prefix) override;
  void Get(const GetRequest& request, const std::function<void(const Json::Value&)>& take) override;
  void Commit() override;
  void Rollback() override;
  int64_t UncommittedBytes() const override { return uncommitted_bytes_; }
  int64_t Uncleared() const override { return totals_.clearing; }
  void ClearSome() override;
  std::optional<std::chrono::steady_clock::time_point> NextGiveBack() const override;
  void GiveBack(std::chrono::steady_clock::time_point now) override;
  void RebuildSuggestions() override;
  SearchReply Search(const SearchRequest& request) override;  ///< defined in search/, whose parts it is made of
  StoreStat Stat() override;

  /// The largest size of the file, in pages; for tests of a full disk. 0: no limit.
  void LimitPages(int64_t pages);
  /// For tests with few documents.
  void LimitClearing(const ClearingLimits& limits) { clearing_.SetLimits(limits); }

 private:
  /// Opens the transaction that the changes until the next commit share.
  void Begin();
  void ShortenLog();

  // What changes a document's row; its words go to texts_.
  int64_t InsertRow(const DocRow& row, int64_t text_bytes);
  void MoveOneByOne(const std::string& from, const std::string& to);
  void UpdateRow(const StoredDocument& before, const DocRow& row, int64_t text_bytes);
  void Remove(const StoredDocument& stored);
  void RemoveAt(const std::string& path);
  void RemoveOneByOne(const std::string& prefix);
  /// Keeps the sums, for a text that had `before` bytes and has `after` now.
  void CountText(int64_t before, int64_t after);
  class AccessPass;  ///< access_changes.cpp, as the next two
  void CountAccess(const DocRow* before, const DocRow* after);
  void GiveFolder(const std::string& path, int64_t access);
  void Changed(int64_t bytes);
  void OnRow(RowWatch::Table table, int64_t number, bool is_update);
  /// A document as Get returns it, with the changes that are not committed.
  Json::Value LoadEntry(const StoredDocument& stored, const std::vector<std::string>& fields);

  const std::shared_ptr<const Schema> schema_;
  // Of the thread that writes.
  Database writer_;
  FieldNames names_;
  FolderTree tree_{writer_};
  AccessRecords access_{writer_};
  FileLinks links_{writer_, tree_, names_};
  ListedDocuments listed_{writer_, tree_};
  PlaceWriter places_{writer_};
  RowWatch watch_{writer_, [this](auto table, int64_t number, bool is_update) { OnRow(table, number, is_update); }};
  TextWriter texts_{writer_, names_, schema_};
  Totals totals_;  ///< with the changes of the open transaction
  Clearing clearing_{writer_, tree_, links_, texts_, totals_};
  int64_t uncommitted_bytes_ = 0;    ///< for the automatic commit: texts, and a fixed amount for each change
  bool suggestions_wanted_ = false;  ///< once nothing is left to be cleared
  bool in_transaction_ = false;      ///< since the first change after a commit

  ReaderPool readers_;  ///< for Search and Stat, on any thread
};

}  // namespace ferrox::engine
