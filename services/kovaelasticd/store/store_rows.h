#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

// Rows of the tables "docs", "info" and "fields", for those who read and those who write.

/// A document as the table "docs" has it, with the path that its folder gives it.
struct StoredDocument {
  int64_t id = 0;
  int64_t folder = FolderTree::kNone;
  int64_t text_bytes = 0;
  DocRow row;
};

/// The sums of an index, as of its last commit.
struct Totals {
  int64_t documents = 0;
  int64_t with_content = 0;
  int64_t text_bytes = 0;
  int64_t version = 0;         ///< the number of commits that have changed it
  int64_t without_access = 0;  ///< documents that have no access record
  bool preparing = false;      ///< it came without access records, and is being given them
  int64_t last_id = 0;         ///< the highest number that a document got; none is given again
  int64_t clearing = 0;        ///< documents that count nowhere else any more, but are still to be cleared (Clearing)
};

/// Selects what ReadRow reads; a condition is to follow.
inline constexpr char kSelectRow[] =
    "SELECT id, folder, leaf, name, ext, kind, size, mtime, text_bytes, derived, error, packed, access, language,"
    " title FROM docs ";
/// The row at hand; `folder_path` is that of its folder.
StoredDocument ReadRow(const Statement& statement, std::string_view folder_path);
/// Binds a row in `folder` to parameters 2 to 15, in the order of the table's columns. All that is bound must live
/// until the statement has run.
void BindRow(Statement& statement, int64_t folder, const DocRow& row, int64_t text_bytes);

/// By path or by number; nothing when there is none, or it is to be cleared. @throws Error kEngineStorage, as all that
/// follow.
std::optional<StoredDocument> FindDocument(Database& database, FolderTree& tree, const std::string& path);
std::optional<StoredDocument> FindDocument(Database& database, FolderTree& tree, int64_t id);

/// Adds the documents that lie in these folders, not those in folders below.
void AddDocumentsIn(Database& database, const std::vector<int64_t>& folders, DocSet& documents);

/// The table "info", as of the reader's snapshot or the writer's last SaveTotals.
Totals LoadTotals(Database& database);
void SaveTotals(Database& database, const Totals& totals);

/// Reads the names that were added since the last call.
void LoadFieldNames(Database& database, FieldNames& names);
/// Gives each member of `document` that has no number one, in the table and in `names`.
/// @throws Error kEngineBadRequest when the index has too many names then.
void AddFieldNames(Database& database, FieldNames& names, const Json::Value& document);

/// What comes right behind all texts that begin with `prefix`; "" when nothing does.
std::string EndOfPrefix(std::string prefix);
/// Binds such an end, so that texts are compared with it by "<".
void BindEnd(Statement& statement, int index, const std::string& end);

/// The order of names in the table: ASCII letters without case, then bytes.
int CompareNames(std::string_view a, std::string_view b);

}  // namespace ferrox::engine
