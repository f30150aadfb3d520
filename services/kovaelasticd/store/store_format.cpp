#define FERROX_SOURCE "sqlite_store"

#include "services/kovaelasticd/store/store_format.h"

#include <syslog.h>

#include "common/log.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/fts.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kApplicationId = 0x4B4F5641;  // "KOVA": what tells an index from other SQLite files

/// The tables of documents and their folders (docs/formats/engine.md). Texts are compared by their bytes but for the
/// names, which are shown in the order of a list: NOCASE.
constexpr const char* kDocumentTables[] = {
    // FolderTree: names end with "/".
    ("CREATE TABLE folders(id INTEGER PRIMARY KEY, parent INTEGER NOT NULL, name TEXT NOT NULL,"
     " access INTEGER NOT NULL DEFAULT 0)"),
    "CREATE UNIQUE INDEX folders_place ON folders(parent, name)",
    "INSERT INTO folders(id, parent, name) VALUES(1, 0, '/')",
    // What is filtered and sorted by has a column. All other members but the text are in `packed`; of those that follow
    // from a column, `derived` only notes that the document has them.
    ("CREATE TABLE docs(id INTEGER PRIMARY KEY, folder INTEGER NOT NULL, leaf TEXT NOT NULL,"
     " name TEXT NOT NULL COLLATE NOCASE, ext TEXT NOT NULL, kind INTEGER NOT NULL, size INTEGER, mtime INTEGER,"
     " text_bytes INTEGER NOT NULL, derived INTEGER NOT NULL, error TEXT, packed BLOB NOT NULL,"
     " access INTEGER NOT NULL DEFAULT 0)"),
    // Here, since folders that are made look for their own document.
    "CREATE UNIQUE INDEX docs_place ON docs(folder, leaf)",
};
constexpr const char* kDocumentIndexes[] = {
    "CREATE INDEX docs_name ON docs(name)",
    "CREATE INDEX docs_kind ON docs(kind, ext)",
    "CREATE INDEX docs_date ON docs(mtime)",
    "CREATE INDEX docs_size ON docs(size)",
    "CREATE INDEX docs_error ON docs(error) WHERE error IS NOT NULL",
};

/// The other tables. FileLinks adds its own, which older files lack.
constexpr const char* kTables[] = {
    // "documents", "with_content" and "text_bytes": sums over docs, so that no figure needs a walk over the table.
    "CREATE TABLE info(key TEXT PRIMARY KEY, value INTEGER NOT NULL) WITHOUT ROWID",
    // The names of the members of documents, by the number that docs.packed has them under.
    "CREATE TABLE fields(number INTEGER PRIMARY KEY, name TEXT NOT NULL UNIQUE)",
    // The texts, for snippets and for taking a document's words out of content_fts again: a table without content
    // cannot tell what it holds. Apart from docs, whose rows stay short for the scans of filters.
    "CREATE TABLE bodies(id INTEGER PRIMARY KEY, zstd BLOB NOT NULL)",
    // Full-text tables by docs.id that keep no text themselves (content=''), nor its length (columnsize=0): of a word
    // they tell in which documents and where it stands.
    "CREATE VIRTUAL TABLE content_fts USING fts5(body, content='', columnsize=0, tokenize='kova')",
    ("CREATE VIRTUAL TABLE meta_fts USING fts5(grams, name, title, text, fields, content='', columnsize=0,"
     " tokenize='kova')"),
    // The words that are in the most documents, for other spellings of what was not found.
    "CREATE TABLE suggestions(word TEXT PRIMARY KEY, documents INTEGER NOT NULL) WITHOUT ROWID",
    // How many bytes of memory words are gathered in before they are written as one segment, and the size in bytes of a
    // segment's pieces: just below a page of the file.
    "INSERT INTO content_fts(content_fts, rank) VALUES('hashsize', 8388608)",
    "INSERT INTO meta_fts(meta_fts, rank) VALUES('hashsize', 4194304)",
    "INSERT INTO content_fts(content_fts, rank) VALUES('pgsz', 8100)",
    "INSERT INTO meta_fts(meta_fts, rank) VALUES('pgsz', 8100)",
};

void SetFormat(Database& database) { database.Execute("PRAGMA user_version = " + std::to_string(kStoreFormat)); }

void MakeTables(Database& database) {
  database.Execute("BEGIN IMMEDIATE");
  database.Execute("PRAGMA application_id = " + std::to_string(kApplicationId));
  SetFormat(database);
  for (const char* sql : kDocumentTables) database.Execute(sql);
  for (const char* sql : kDocumentIndexes) database.Execute(sql);
  for (const char* sql : kTables) database.Execute(sql);
  database.Execute("COMMIT");
}

/// Format 2 took the words of folders' names for words of each document, unless the mappings said otherwise.
bool PathsArePlain(const Json::Value& mappings) {
  const Json::Value by_default = mappings.isObject() ? mappings["default"].get("_all", true) : Json::Value(true);
  const auto is_plain = [&](const char* name) {
    const Json::Value& field = mappings.isObject() ? mappings["properties"][name] : Json::Value::nullSingleton();
    return field.isObject() ? field.get("_all", by_default) != false : by_default != false;
  };
  return is_plain(field::kPath) || is_plain(field::kParent);
}

/// Gives each document of format 2, whose row had its whole path, its place in the tree of folders. Numbers stay, and
/// so do all words and texts, which go by them.
void UpgradeFrom2(Database& database, const Schema& schema) {
  FERROX_FAIL_IF(PathsArePlain(schema.Mappings()), Error::kEngineStorage,
                 "index file " + database.Path() +
                     ": it has format 2, and words of folders' names in it; 'fileindexctl rebuild' makes it anew");
  Log(LOG_NOTICE, "index file %s: it has format 2, and is brought to format %d", database.Path().c_str(),
      static_cast<int>(kStoreFormat));
  database.Execute("BEGIN IMMEDIATE");
  try {
    database.Execute("ALTER TABLE docs RENAME TO docs_2");
    for (const char* sql : kDocumentTables) database.Execute(sql);
    FolderTree tree(database);
    Statement documents = database.Prepare("SELECT id, path FROM docs_2 ORDER BY path");
    Statement copy = database.Prepare(
        "INSERT INTO docs SELECT id, ?2, ?3, name, ext, kind, size, mtime, text_bytes, derived, error, packed, 0"
        " FROM docs_2 WHERE id = ?1");
    while (documents.Step()) {
      const std::string path(documents.Text(1));
      const int64_t folder = tree.Make(FolderTree::FolderOf(path));
      copy.Bind(1, documents.Int(0)).Bind(2, folder).Bind(3, FolderTree::LeafOf(path)).Run();
    }
    documents.Reset();
    database.Execute("DROP TABLE docs_2");
    for (const char* sql : kDocumentIndexes) database.Execute(sql);
    SetFormat(database);
    database.Execute("COMMIT");
  } catch (...) {
    (void)sqlite3_exec(database.Handle(), "ROLLBACK", nullptr, nullptr, nullptr);
    throw;
  }
}

/// Files of format 3 that were made before rights were recorded lack this: a table, and a column for its numbers, which
/// are at the end of rows so that adding them rewrites none.
void AddAccess(Database& database) {
  if (database.QueryInt("SELECT count(*) FROM sqlite_master WHERE name = 'access'") != 0) return;
  database.Execute("BEGIN IMMEDIATE");
  database.Execute(
      "CREATE TABLE access(id INTEGER PRIMARY KEY, uid INTEGER NOT NULL, gid INTEGER NOT NULL, mode INTEGER NOT NULL,"
      " acl TEXT NOT NULL)");
  database.Execute("CREATE UNIQUE INDEX access_record ON access(uid, gid, mode, acl)");
  for (const char* table : {"docs", "folders"}) {
    const std::string has =
        "SELECT count(*) FROM pragma_table_info('" + std::string(table) + "') WHERE name = 'access'";
    if (database.QueryInt(has.c_str()) != 0) continue;
    database.Execute("ALTER TABLE " + std::string(table) + " ADD COLUMN access INTEGER NOT NULL DEFAULT 0");
  }
  database.Execute("COMMIT");
}

/// The format, 2 or more.
int64_t CheckFormat(Database& database) {
  const bool ours = database.QueryInt("PRAGMA application_id") == kApplicationId;
  FERROX_FAIL_IF(
      !ours, Error::kEngineStorage,
      "index file " + database.Path() + ": it is no index of this engine; 'fileindexctl rebuild' makes it anew");
  const int64_t version = database.QueryInt("PRAGMA user_version");
  FERROX_FAIL_IF(version > kStoreFormat, Error::kEngineStorage,
                 "index file " + database.Path() + ": it has format " + std::to_string(version) +
                     ", this engine reads formats up to " + std::to_string(kStoreFormat) +
                     "; use the engine that wrote it, or 'fileindexctl rebuild', which makes it anew");
  FERROX_FAIL_IF(version < 2, Error::kEngineStorage,
                 "index file " + database.Path() + ": it has format " + std::to_string(version) +
                     ", which is too old; 'fileindexctl rebuild' makes it anew");
  return version;
}

}  // namespace

void PrepareStore(Database& database, bool create, const Schema& schema) {
  database.Execute("PRAGMA page_size = 8192");
  database.Execute("PRAGMA cache_size = -8192");  // below 0: KiB
  // Readers see the last commit, and wait for no writer, while changes go to the write-ahead log. FULL: a commit is on
  // the disk when it returns.
  database.Execute("PRAGMA journal_mode = WAL");
  database.Execute("PRAGMA synchronous = FULL");
  database.Execute("PRAGMA wal_autocheckpoint = 1000");  // pages
  database.Execute("PRAGMA journal_size_limit = 8388608");
  RegisterFullText(database);
  if (create && database.QueryInt("SELECT count(*) FROM sqlite_master") == 0) MakeTables(database);
  if (CheckFormat(database) == 2) UpgradeFrom2(database, schema);
  AddAccess(database);
}

}  // namespace ferrox::engine
