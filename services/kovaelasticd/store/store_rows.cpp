#define FERROX_SOURCE "sqlite_store_write"

#include "services/kovaelasticd/store/store_rows.h"

#include <algorithm>

#include "base/text.h"
#include "common/log.h"

namespace ferrox::engine {

namespace {

/// More names than that come from no extractor.
constexpr int64_t kFieldNamesMax = 4096;

}  // namespace

StoredDocument ReadRow(const Statement& statement, std::string_view folder_path) {
  StoredDocument stored;
  stored.id = statement.Int(0);
  stored.folder = statement.Int(1);
  stored.row.path = folder_path;
  stored.row.path += statement.Text(2);
  stored.row.name = statement.Text(3);
  stored.row.ext = statement.Text(4);
  stored.row.kind = static_cast<int32_t>(statement.Int(5));
  if (!statement.IsNull(6)) stored.row.size = statement.Int(6);
  if (!statement.IsNull(7)) stored.row.mtime = statement.Int(7);
  stored.text_bytes = statement.Int(8);
  stored.row.derived = static_cast<uint32_t>(statement.Int(9));
  stored.row.error = statement.Text(10);
  stored.row.packed = statement.Text(11);
  stored.row.access = statement.Int(12);
  stored.row.language = LanguageOfNumber(statement.Int(13));
  stored.row.title = statement.Text(14);
  return stored;
}

void BindRow(Statement& statement, int64_t folder, const DocRow& row, int64_t text_bytes) {
  statement.Bind(2, folder).Bind(3, FolderTree::LeafOf(row.path));
  statement.Bind(4, std::string_view(row.name)).Bind(5, std::string_view(row.ext)).Bind(6, int64_t{row.kind});
  row.size.has_value() ? statement.Bind(7, *row.size) : statement.BindNull(7);
  row.mtime.has_value() ? statement.Bind(8, *row.mtime) : statement.BindNull(8);
  statement.Bind(9, text_bytes).Bind(10, int64_t{row.derived});
  row.error.empty() ? statement.BindNull(11) : statement.Bind(11, std::string_view(row.error));
  statement.BindBlob(12, row.packed).Bind(13, row.access);
  statement.Bind(14, static_cast<int64_t>(row.language)).Bind(15, std::string_view(row.title));
}

std::optional<StoredDocument> FindDocument(Database& database, FolderTree& tree, const std::string& path) {
  static const std::string sql = std::string(kSelectRow) + "WHERE folder = ?1 AND leaf = ?2";
  const std::string_view folder_path = FolderTree::FolderOf(path);
  const int64_t folder = tree.Find(folder_path);
  if (folder == FolderTree::kNone) return std::nullopt;
  Statement statement = database.Prepare(sql);
  statement.Bind(1, folder).Bind(2, FolderTree::LeafOf(path));
  return statement.Step() ? std::optional<StoredDocument>(ReadRow(statement, folder_path)) : std::nullopt;
}

std::optional<StoredDocument> FindDocument(Database& database, FolderTree& tree, int64_t id) {
  static const std::string sql = std::string(kSelectRow) + "WHERE id = ?1";
  Statement statement = database.Prepare(sql);
  statement.Bind(1, id);
  if (!statement.Step()) return std::nullopt;
  const std::string folder_path = tree.PathOf(statement.Int(1));
  return folder_path.empty() ? std::nullopt : std::optional<StoredDocument>(ReadRow(statement, folder_path));
}

void AddDocumentsIn(Database& database, const std::vector<int64_t>& folders, DocSet& documents) {
  Statement rows = database.Prepare("SELECT id FROM docs WHERE folder = ?1");
  for (const int64_t folder : folders) {
    for (rows.Bind(1, folder); rows.Step();) documents.Add(rows.Int(0));
    rows.Reset();
  }
}

Totals LoadTotals(Database& database) {
  Totals totals;
  std::optional<int64_t> without_access, preparing, last_id;  // a file from before these were kept has none
  Statement statement = database.Prepare("SELECT key, value FROM info");
  while (statement.Step()) {
    const std::string_view key = statement.Text(0);
    if (key == "documents") totals.documents = statement.Int(1);
    if (key == "with_content") totals.with_content = statement.Int(1);
    if (key == "text_bytes") totals.text_bytes = statement.Int(1);
    if (key == "version") totals.version = statement.Int(1);
    if (key == "without_access") without_access = statement.Int(1);
    if (key == "preparing") preparing = statement.Int(1);
    if (key == "last_id") last_id = statement.Int(1);
    if (key == "clearing") totals.clearing = statement.Int(1);
  }
  totals.without_access = without_access.value_or(totals.documents);
  totals.preparing = preparing.value_or(1) != 0 && totals.without_access > 0;
  totals.last_id = last_id.has_value() ? *last_id : database.QueryInt("SELECT max(id) FROM docs");
  return totals;
}

void SaveTotals(Database& database, const Totals& totals) {
  const std::pair<std::string_view, int64_t> values[] = {
      {"documents", totals.documents},   {"with_content", totals.with_content},
      {"text_bytes", totals.text_bytes}, {"without_access", totals.without_access},
      {"version", totals.version},       {"last_id", totals.last_id},
      {"clearing", totals.clearing},     {"preparing", totals.preparing ? 1 : 0}};
  Statement statement = database.Prepare("INSERT OR REPLACE INTO info(key, value) VALUES(?1, ?2)");
  for (const auto& [key, value] : values) statement.Bind(1, key).Bind(2, value).Run();
}

void LoadFieldNames(Database& database, FieldNames& names) {
  Statement statement = database.Prepare("SELECT number, name FROM fields WHERE number > ?1 ORDER BY number");
  statement.Bind(1, names.Largest());
  while (statement.Step()) names.Add(statement.Int(0), std::string(statement.Text(1)));
}

void AddFieldNames(Database& database, FieldNames& names, const Json::Value& document) {
  for (const std::string& name : NamesNeeded(document, names)) {
    const int64_t number = names.Largest() + 1;
    FERROX_FAIL_IF(number > kFieldNamesMax, Error::kEngineBadRequest,
                   "field \"" + name + "\" is one too many: an index holds at most " + std::to_string(kFieldNamesMax) +
                       " different field names");
    database.Prepare("INSERT INTO fields(number, name) VALUES(?1, ?2)")
        .Bind(1, number)
        .Bind(2, std::string_view(name))
        .Run();
    names.Add(number, name);
  }
}

std::string EndOfPrefix(std::string prefix) {
  while (!prefix.empty() && static_cast<unsigned char>(prefix.back()) == 0xFF) prefix.pop_back();
  if (!prefix.empty()) prefix.back() = static_cast<char>(static_cast<unsigned char>(prefix.back()) + 1);
  return prefix;
}

void BindEnd(Statement& statement, int index, const std::string& end) {
  // SQLite orders any blob behind all texts.
  end.empty() ? statement.BindBlob(index, "") : statement.Bind(index, std::string_view(end));
}

int CompareNames(std::string_view a, std::string_view b) {
  const auto byte = [](char c) { return static_cast<unsigned char>(base::LowerAscii(c)); };
  const size_t common = std::min(a.size(), b.size());
  for (size_t i = 0; i < common; ++i) {
    const int difference = byte(a[i]) - byte(b[i]);
    if (difference != 0) return difference;
  }
  return a.size() == b.size() ? 0 : a.size() < b.size() ? -1 : 1;
}

}  // namespace ferrox::engine
