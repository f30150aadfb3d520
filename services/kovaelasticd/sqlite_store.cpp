#include "services/kovaelasticd/sqlite_store.h"

#include <sys/stat.h>
#include <unistd.h>

#include "common/file_util.h"
#include "common/log.h"
#include "services/kovaelasticd/fts.h"
#include "services/kovaelasticd/index_files.h"
#include "services/kovaelasticd/sqlite_search.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kApplicationId = 0x4B4F5641;
constexpr int64_t kFormatVersion = 2;
constexpr size_t kIdleReadersMax = 4;
constexpr int64_t kLogMaxBytes = 16 << 20;

constexpr const char* kTables[] = {
    "CREATE TABLE info(key TEXT PRIMARY KEY, value INTEGER NOT NULL) WITHOUT ROWID",
    "CREATE TABLE fields(number INTEGER PRIMARY KEY, name TEXT NOT NULL UNIQUE)",
    ("CREATE TABLE docs(id INTEGER PRIMARY KEY, path TEXT NOT NULL, name TEXT NOT NULL COLLATE NOCASE,"
     " ext TEXT NOT NULL, kind INTEGER NOT NULL, size INTEGER, mtime INTEGER, text_bytes INTEGER NOT NULL,"
     " derived INTEGER NOT NULL, error TEXT, packed BLOB NOT NULL)"),
    "CREATE UNIQUE INDEX docs_path ON docs(path)",
    "CREATE INDEX docs_name ON docs(name)",
    "CREATE INDEX docs_kind ON docs(kind, ext)",
    "CREATE INDEX docs_date ON docs(mtime)",
    "CREATE INDEX docs_size ON docs(size)",
    "CREATE INDEX docs_error ON docs(error) WHERE error IS NOT NULL",
    "CREATE TABLE bodies(id INTEGER PRIMARY KEY, zstd BLOB NOT NULL)",
    "CREATE VIRTUAL TABLE content_fts USING fts5(body, content='', columnsize=0, tokenize='kova')",
    ("CREATE VIRTUAL TABLE meta_fts USING fts5(grams, name, title, text, fields, content='', columnsize=0,"
     " tokenize='kova')"),
    "CREATE TABLE suggestions(word TEXT PRIMARY KEY, documents INTEGER NOT NULL) WITHOUT ROWID",
    // Words are gathered in so much memory, in bytes, before they are written as one piece.
    "INSERT INTO content_fts(content_fts, rank) VALUES('hashsize', 8388608)",
    "INSERT INTO meta_fts(meta_fts, rank) VALUES('hashsize', 4194304)",
    "INSERT INTO content_fts(content_fts, rank) VALUES('pgsz', 8100)",
    "INSERT INTO meta_fts(meta_fts, rank) VALUES('pgsz', 8100)",
};

int64_t BytesOnDisk(const std::string& path) {
  struct stat status = {};
  return stat(path.c_str(), &status) == 0 ? int64_t{status.st_blocks} * 512 : 0;
}

Database::Mode OpeningMode(const std::string& path, bool create) {
  return create && !IsFileExist(path) ? Database::Mode::kCreate : Database::Mode::kWrite;
}

}  // namespace

IndexStore::~IndexStore() = default;

StoreReader::StoreReader(const std::string& path) : database(path, Database::Mode::kRead) {
  database.Execute("PRAGMA cache_size = -8192");
  RegisterFullText(database);
  database.Execute("CREATE VIRTUAL TABLE temp.meta_terms USING fts5vocab('main', 'meta_fts', 'instance')");
  database.Execute("PRAGMA query_only = 1");
}

SqliteStore::SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema)
    : schema_(std::move(schema)), writer_(path, OpeningMode(path, create)) {
  writer_.Execute("PRAGMA page_size = 8192");
  writer_.Execute("PRAGMA cache_size = -8192");
  writer_.Execute("PRAGMA journal_mode = WAL");
  writer_.Execute("PRAGMA synchronous = FULL");
  writer_.Execute("PRAGMA wal_autocheckpoint = 1000");
  writer_.Execute("PRAGMA journal_size_limit = 8388608");
  RegisterFullText(writer_);
  if (create && writer_.QueryInt("SELECT count(*) FROM sqlite_master") == 0) MakeTables();
  CheckFormat();
  links_.MakeTables();
  LoadFieldNames(writer_, names_);
  totals_ = LoadTotals(writer_);
  SyncIndexFolder(Dirname(path));
}

SqliteStore::~SqliteStore() = default;

void SqliteStore::MakeTables() {
  writer_.Execute("BEGIN IMMEDIATE");
  writer_.Execute("PRAGMA application_id = " + std::to_string(kApplicationId));
  writer_.Execute("PRAGMA user_version = " + std::to_string(kFormatVersion));
  for (const char* sql : kTables) writer_.Execute(sql);
  writer_.Execute("COMMIT");
}

void SqliteStore::CheckFormat() {
  const bool ours = writer_.QueryInt("PRAGMA application_id") == kApplicationId;
  FERROX_FAIL_IF(
      !ours, Error::kEngineStorage,
      "index file " + writer_.Path() + ": it is no index of this engine; 'fileindexctl rebuild' makes it anew");
  const int64_t version = writer_.QueryInt("PRAGMA user_version");
  FERROX_FAIL_IF(version != kFormatVersion, Error::kEngineStorage,
                 "index file " + writer_.Path() + ": it has format " + std::to_string(version) +
                     ", this engine reads format " + std::to_string(kFormatVersion) +
                     "; use the engine that wrote it, or 'fileindexctl rebuild', which makes it anew");
}

void SqliteStore::Begin() {
  if (in_transaction_) return;
  writer_.Execute("BEGIN IMMEDIATE");
  in_transaction_ = true;
}

void SqliteStore::Commit() {
  if (!in_transaction_) return;
  Flush();
  SaveTotals(writer_, totals_);
  writer_.Execute("COMMIT");
  in_transaction_ = false;
  uncommitted_bytes_ = 0;
  ShortenLog();
}

/// After a large transaction, moves the write-ahead log into the database and cuts it, unless somebody reads it just
/// now.
void SqliteStore::ShortenLog() {
  if (BytesOnDisk(writer_.Path() + "-wal") < kLogMaxBytes) return;
  (void)sqlite3_busy_timeout(writer_.Handle(), 0);
  // What fails here is tried again with the next transaction.
  (void)sqlite3_wal_checkpoint_v2(writer_.Handle(), nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  (void)sqlite3_busy_timeout(writer_.Handle(), Database::kBusyTimeoutMs);
}

void SqliteStore::Rollback() {
  pending_.clear();
  pending_bytes_ = 0;
  uncommitted_bytes_ = 0;
  in_transaction_ = false;
  // A failure may have ended the transaction already.
  if (sqlite3_get_autocommit(writer_.Handle()) == 0) writer_.Execute("ROLLBACK");
  names_ = FieldNames();
  LoadFieldNames(writer_, names_);
  totals_ = LoadTotals(writer_);
}

void SqliteStore::LimitPages(int64_t pages) {
  (void)writer_.QueryInt(("PRAGMA max_page_count = " + std::to_string(pages == 0 ? 4294967294 : pages)).c_str());
}

std::unique_ptr<StoreReader> SqliteStore::BorrowReader() {
  {
    const base::MutexLock guard(readers_mutex_);
    if (!readers_.empty()) {
      std::unique_ptr<StoreReader> reader = std::move(readers_.back());
      readers_.pop_back();
      return reader;
    }
  }
  return std::make_unique<StoreReader>(writer_.Path());
}

void SqliteStore::ReturnReader(std::unique_ptr<StoreReader> reader) {
  const base::MutexLock guard(readers_mutex_);
  if (readers_.size() < kIdleReadersMax) readers_.push_back(std::move(reader));
}

StoreStat SqliteStore::Stat() {
  StoreStat stat;
  std::unique_ptr<StoreReader> reader = BorrowReader();
  {
    const Totals totals = LoadTotals(reader->database);
    stat.documents = totals.documents;
    stat.with_content = totals.with_content;
    stat.text_bytes = totals.text_bytes;
    Statement errors = reader->database.Prepare(
        "SELECT error, count(*), min(path), max(path) FROM docs WHERE error IS NOT NULL GROUP BY error");
    while (errors.Step()) {
      const std::string reason(errors.Text(0));
      stat.extract_errors[reason] = errors.Int(1);
      for (int column = 2; column <= (errors.Int(1) == 1 ? 2 : 3); ++column) {
        stat.extract_error_examples[reason].emplace_back(errors.Text(column));
      }
    }
  }
  ReturnReader(std::move(reader));
  for (const char* suffix : {"", "-wal", "-shm"}) {
    stat.bytes_on_disk += BytesOnDisk(writer_.Path() + suffix);
  }
  return stat;
}

SearchReply SqliteStore::Search(const SearchRequest& request) {
  std::unique_ptr<StoreReader> reader = BorrowReader();
  reader->database.Execute("BEGIN");
  LoadFieldNames(reader->database, reader->names);
  SearchReply reply = Searcher(*reader, request).Run();
  reader->database.Execute("COMMIT");
  ReturnReader(std::move(reader));
  return reply;
}

}  // namespace ferrox::engine
