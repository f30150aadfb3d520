#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

// Rows of the tables "docs", "info" and "fields", for those who read and those who write.

/// A document as the table "docs" has it.
struct StoredDocument {
  int64_t id = 0;
  int64_t text_bytes = 0;
  DocRow row;
};

/// The sums of an index, as of its last commit.
struct Totals {
  int64_t documents = 0;
  int64_t with_content = 0;
  int64_t text_bytes = 0;
};

/// Selects what ReadRow reads; a condition is to follow.
inline constexpr char kSelectRow[] =
    "SELECT id, path, name, ext, kind, size, mtime, text_bytes, derived, error, packed FROM docs ";
StoredDocument ReadRow(const Statement& statement);
/// Binds a row to parameters 2 to 11, in the order of the table's columns.
void BindRow(Statement& statement, const DocRow& row, int64_t text_bytes);

/// By path or by number; nothing when there is none. @throws Error kEngineStorage, as all that follow.
std::optional<StoredDocument> FindDocument(Database& database, const std::string& path);
std::optional<StoredDocument> FindDocument(Database& database, int64_t id);

/// The table "info", as of the reader's snapshot or the writer's last SaveTotals.
Totals LoadTotals(Database& database);
void SaveTotals(Database& database, const Totals& totals);

/// Reads the names that were added since the last call.
void LoadFieldNames(Database& database, FieldNames& names);
/// Gives each member of `document` that has no number one, in the table and in `names`.
/// @throws Error kEngineBadRequest when the index has too many names then.
void AddFieldNames(Database& database, FieldNames& names, const Json::Value& document);

/// Binds the range of all texts that begin with `prefix` to the parameters 1 (from) and 2 (before).
class PrefixRange {
 public:
  explicit PrefixRange(std::string prefix);
  void Bind(Statement& statement) const;

 private:
  std::string begin_;
  std::string end_;  ///< "": no text lies behind the range
};

/// The order of names in the table: ASCII letters without case, then bytes.
int CompareNames(std::string_view a, std::string_view b);

}  // namespace ferrox::engine
