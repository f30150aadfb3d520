#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/access_records.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/file_links.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/listed_documents.h"
#include "services/kovaelasticd/store/name_marks.h"
#include "services/kovaelasticd/store/place_writer.h"
#include "services/kovaelasticd/store/row_watch.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

/// One half of an index: which documents there are and by what numbers, where they lie, who may read them, what was
/// last seen of their files, and their fields. Changes with the file system, so it is always in a SQLite file on this
/// host; the other half, Words, goes by its numbers.
///
/// Keeps what follows from rows in line with them: sums, folders without documents, records of folders, names of one
/// file, places. For the thread that writes, by whose connection it also reads: uncommitted changes are seen. Every
/// member throws Error kEngineStorage, after which Rollback is to be called.
class Catalogue {
 public:
  /// Opens the file, or makes it with `create` when it is missing.
  Catalogue(const std::string& path, bool create);
  Catalogue(const Catalogue&) = delete;
  Catalogue& operator=(const Catalogue&) = delete;

  /// Opens the transaction that the changes until the next commit share, unless it is open.
  void Begin();
  bool InTransaction() const { return in_transaction_; }
  /// Ends it, and makes its changes durable.
  void Commit();
  void Rollback();

  std::optional<StoredDocument> Find(const std::string& path) { return FindDocument(database_, tree_, path); }
  /// The documents that a request is about, in the order of their paths, `limit` of them at most.
  void List(const GetRequest& request, const std::function<void(const StoredDocument&)>& take);

  // Changes, within the transaction.

  /// Adds a document. @return its number, which none had before.
  int64_t Insert(const DocRow& row, int64_t text_bytes);
  /// `seen`: the row tells of a look at the document's file, other than that of before.
  void Update(const StoredDocument& before, const DocRow& row, int64_t text_bytes, bool seen);
  void Remove(const StoredDocument& stored);
  /// If there is a folder at `path`, it gets the access record of that number.
  void GiveFolder(const std::string& path, int64_t access);
  /// To be called now and then: writes what has gathered, if it is much.
  void Relieve();

  // What changes of a special kind work on directly.

  Database& Connection() { return database_; }
  FieldNames& Names() { return names_; }
  FolderTree& Tree() { return tree_; }
  AccessRecords& Access() { return access_; }
  FileLinks& Links() { return links_; }
  /// Marks some names by `rules`, in the transaction that is open.
  void MarkNames(const std::string& rules) { name_marks_.Turn(rules, totals_.version + 1); }
  const NameMarks& Marks() const { return name_marks_; }
  ListedDocuments& Listed() { return listed_; }
  const ListedDocuments& Listed() const { return listed_; }
  /// The sums, with the changes of the open transaction.
  Totals& Sums() { return totals_; }
  const Totals& Sums() const { return totals_; }

 private:
  void ListIn(const GetRequest& request, const std::function<void(const StoredDocument&)>& take);
  void CountText(int64_t before, int64_t after);
  void CountAccess(const DocRow* before, const DocRow* after);
  void OnRow(RowWatch::Table table, int64_t number, bool is_update);
  void ShortenLog();

  Database database_;
  FieldNames names_;
  FolderTree tree_{database_};
  AccessRecords access_{database_};
  FileLinks links_{database_, tree_, names_};
  ListedDocuments listed_{database_, tree_};
  PlaceWriter places_{database_};
  NameMarks name_marks_{database_, places_};
  RowWatch watch_{database_, [this](auto table, int64_t number, bool is_update) { OnRow(table, number, is_update); }};
  Totals totals_;
  bool in_transaction_ = false;  ///< since the first change after a commit
};

}  // namespace ferrox::engine
