#define FERROX_SOURCE "sqlite_store"

#include "services/kovaelasticd/store/store_format.h"

#include <cerrno>

#include "common/log.h"
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
     " access INTEGER NOT NULL DEFAULT 0, language INTEGER NOT NULL DEFAULT 0, title TEXT NOT NULL DEFAULT '')"),
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
    "INSERT INTO content_fts(content_fts, rank) VALUES('automerge', 8)",
    "INSERT INTO meta_fts(meta_fts, rank) VALUES('pgsz', 8100)",
};

/// AccessRecords: each distinct record, by the number that documents and folders have.
constexpr const char* kAccessTables[] = {
    ("CREATE TABLE access(id INTEGER PRIMARY KEY, uid INTEGER NOT NULL, gid INTEGER NOT NULL, mode INTEGER NOT NULL,"
     " acl TEXT NOT NULL)"),
    "CREATE UNIQUE INDEX access_record ON access(uid, gid, mode, acl)",
};

/// The format, kOldestFormat or more. A file that is refused is closed as it was opened: what its log holds stays
/// there.
int64_t CheckFormat(Database& database) {
  const auto empty_log_when_closed = [&database](bool whether) {
    (void)sqlite3_db_config(database.Handle(), SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, whether ? 0 : 1, nullptr);
  };
  empty_log_when_closed(false);
  const bool ours = database.QueryInt("PRAGMA application_id") == kApplicationId;
  FERROX_FAIL_IF(
      !ours, Error::kEngineStorage,
      "index file " + database.Path() + ": it is no index of this engine; 'fileindexctl rebuild' makes it anew");
  const int64_t version = database.QueryInt("PRAGMA user_version");
  FERROX_FAIL_IF(version > kStoreFormat, Error::kEngineStorage,
                 "index file " + database.Path() + ": it has format " + std::to_string(version) +
                     ", this engine reads formats up to " + std::to_string(kStoreFormat) +
                     "; use the engine that wrote it, or 'fileindexctl rebuild', which makes it anew");
  FERROX_FAIL_IF(version < kOldestFormat, Error::kEngineStorage,
                 "index file " + database.Path() + ": it has format " + std::to_string(version) +
                     ", which is too old; 'fileindexctl rebuild' makes it anew");
  empty_log_when_closed(true);
  return version;
}

}  // namespace

bool NeedsUpgrade(const std::string& path) {
  Database database(path, Database::Mode::kRead);
  return CheckFormat(database) < kStoreFormat;
}

void MakeStoreTables(Database& database) {
  database.Execute("PRAGMA application_id = " + std::to_string(kApplicationId));
  database.Execute("PRAGMA user_version = " + std::to_string(kStoreFormat));
  for (const char* sql : kDocumentTables) database.Execute(sql);
  for (const char* sql : kAccessTables) database.Execute(sql);
  for (const char* sql : kTables) database.Execute(sql);
}

void MakeStoreIndexes(Database& database) {
  for (const char* sql : kDocumentIndexes) database.Execute(sql);
}

void PrepareStore(Database& database, bool create) {
  database.Execute("PRAGMA page_size = 8192");
  const bool is_new = create && database.QueryInt("SELECT count(*) FROM sqlite_master") == 0;
  FERROX_FAIL_IF(!is_new && CheckFormat(database) < kStoreFormat, Error::kEngineStorage,
                 "index file " + database.Path() + ": it has an older format, and is yet to be upgraded");
  database.Execute("PRAGMA cache_size = -8192");  // below 0: KiB
  // Readers see the last commit, and wait for no writer, while changes go to the write-ahead log. FULL: a commit is on
  // the disk when it returns.
  database.Execute("PRAGMA journal_mode = WAL");
  database.Execute("PRAGMA synchronous = FULL");
  database.Execute("PRAGMA wal_autocheckpoint = " + std::to_string(kLogPages));
  database.Execute("PRAGMA journal_size_limit = 8388608");
  RegisterFullText(database);
  if (!is_new) return;
  database.Execute("BEGIN IMMEDIATE");
  MakeStoreTables(database);
  MakeStoreIndexes(database);
  database.Execute("COMMIT");
}

}  // namespace ferrox::engine
