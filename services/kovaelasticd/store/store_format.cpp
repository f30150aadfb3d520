#define FERROX_SOURCE "sqlite_store"

#include "services/kovaelasticd/store/store_format.h"

#include "common/log.h"
#include "services/kovaelasticd/store/fts.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kApplicationId = 0x4B4F5641;  // "KOVA": what tells an index from other SQLite files

/// The tables of an index (docs/formats/engine.md). FileLinks adds its own, which older files of this format lack.
constexpr const char* kTables[] = {
    // "documents", "with_content" and "text_bytes": sums over docs, so that no figure needs a walk over the table.
    "CREATE TABLE info(key TEXT PRIMARY KEY, value INTEGER NOT NULL) WITHOUT ROWID",
    // The names of the members of documents, by the number that docs.packed has them under.
    "CREATE TABLE fields(number INTEGER PRIMARY KEY, name TEXT NOT NULL UNIQUE)",
    // What is filtered and sorted by has a column. All other members but the text are in `packed`; of those that follow
    // from a column, `derived` only notes that the document has them. NOCASE: names are shown in the order of a list.
    ("CREATE TABLE docs(id INTEGER PRIMARY KEY, path TEXT NOT NULL, name TEXT NOT NULL COLLATE NOCASE,"
     " ext TEXT NOT NULL, kind INTEGER NOT NULL, size INTEGER, mtime INTEGER, text_bytes INTEGER NOT NULL,"
     " derived INTEGER NOT NULL, error TEXT, packed BLOB NOT NULL)"),
    "CREATE UNIQUE INDEX docs_path ON docs(path)",
    "CREATE INDEX docs_name ON docs(name)",
    "CREATE INDEX docs_kind ON docs(kind, ext)",
    "CREATE INDEX docs_date ON docs(mtime)",
    "CREATE INDEX docs_size ON docs(size)",
    "CREATE INDEX docs_error ON docs(error) WHERE error IS NOT NULL",
    // The texts, for snippets and for taking a document's words out of content_fts again: a table without content
    // cannot
    // tell what it holds. Apart from docs, whose rows stay short for the scans of filters.
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

void MakeTables(Database& database) {
  database.Execute("BEGIN IMMEDIATE");
  database.Execute("PRAGMA application_id = " + std::to_string(kApplicationId));
  database.Execute("PRAGMA user_version = " + std::to_string(kStoreFormat));
  for (const char* sql : kTables) database.Execute(sql);
  database.Execute("COMMIT");
}

void CheckFormat(Database& database) {
  const bool ours = database.QueryInt("PRAGMA application_id") == kApplicationId;
  FERROX_FAIL_IF(
      !ours, Error::kEngineStorage,
      "index file " + database.Path() + ": it is no index of this engine; 'fileindexctl rebuild' makes it anew");
  const int64_t version = database.QueryInt("PRAGMA user_version");
  FERROX_FAIL_IF(version != kStoreFormat, Error::kEngineStorage,
                 "index file " + database.Path() + ": it has format " + std::to_string(version) +
                     ", this engine reads format " + std::to_string(kStoreFormat) +
                     "; use the engine that wrote it, or 'fileindexctl rebuild', which makes it anew");
}

}  // namespace

void PrepareStore(Database& database, bool create) {
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
  CheckFormat(database);
}

}  // namespace ferrox::engine
