#include "services/kovaelasticd/store/sqlite_store.h"

#include <algorithm>

#include "common/file_util.h"
#include "services/kovaelasticd/store/index_files.h"
#include "services/kovaelasticd/store/path_walk.h"
#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/store_stat.h"
#include "services/kovaelasticd/store/suggest.h"

namespace ferrox::engine {

namespace {

/// The write-ahead log is cut after a transaction that made it longer than this many bytes.
constexpr int64_t kLogMaxBytes = 16 << 20;

Database::Mode OpeningMode(const std::string& path, bool create) {
  return create && !IsFileExist(path) ? Database::Mode::kCreate : Database::Mode::kWrite;
}

}  // namespace

IndexStore::~IndexStore() = default;

SqliteStore::SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema)
    : schema_(std::move(schema)), writer_(path, OpeningMode(path, create)), readers_(path) {
  PrepareStore(writer_, create);
  links_.MakeTables();
  places_.MakeTable();
  places_.Forget();  // what an upgrade has changed is in there
  LoadFieldNames(writer_, names_);
  totals_ = LoadTotals(writer_);
  SyncIndexFolder(Dirname(path));
}

SqliteStore::~SqliteStore() = default;

void SqliteStore::OnRow(RowWatch::Table table, int64_t number, bool is_update) {
  listed_.OnRow(table, number, is_update);
  places_.OnRow(table, number);
}

void SqliteStore::Begin() {
  if (in_transaction_) return;
  writer_.Execute("BEGIN IMMEDIATE");
  in_transaction_ = true;
}

void SqliteStore::Commit() {
  if (!in_transaction_) return;
  texts_.Flush();
  places_.Flush(++totals_.version);
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
  const int result = sqlite3_wal_checkpoint_v2(writer_.Handle(), nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  (void)sqlite3_busy_timeout(writer_.Handle(), Database::kBusyTimeoutMs);
  writer_.CheckDamage(result);  // what else fails is tried again with the next transaction
}

void SqliteStore::Rollback() {
  texts_.Forget();
  uncommitted_bytes_ = 0;
  in_transaction_ = false;
  // A failure may have ended the transaction already.
  if (sqlite3_get_autocommit(writer_.Handle()) == 0) writer_.Execute("ROLLBACK");
  tree_.Forget();
  access_.Forget();
  listed_.Forget();
  clearing_.Forget();
  places_.Forget();
  names_ = FieldNames();
  LoadFieldNames(writer_, names_);
  totals_ = LoadTotals(writer_);
}

void SqliteStore::LimitPages(int64_t pages) {
  (void)writer_.QueryInt(("PRAGMA max_page_count = " + std::to_string(pages == 0 ? 4294967294 : pages)).c_str());
}

Json::Value SqliteStore::LoadEntry(const StoredDocument& stored, const std::vector<std::string>& fields) {
  Json::Value entry = UnpackDocument(stored.row, names_, fields);
  const auto names = [&fields](const char* name) {
    return std::find(fields.begin(), fields.end(), name) != fields.end();
  };
  const bool wants_access = stored.row.access != AccessRecords::kNone && (fields.empty() || names(field::kAccess));
  if (wants_access) entry[field::kAccess] = access_.TextOf(stored.row.access);
  if (names(field::kTextContent) && stored.text_bytes > 0) entry[field::kTextContent] = texts_.Text(stored.id);
  return entry;
}

void SqliteStore::Get(const GetRequest& request, const std::function<void(const Json::Value&)>& take) {
  if (!request.term.empty()) {
    const std::optional<StoredDocument> stored = FindDocument(writer_, tree_, request.term);
    if (stored.has_value()) take(LoadEntry(*stored, request.fields));
    return;
  }
  if (request.suspects || request.unread || request.file != 0) {
    for (const int64_t id : listed_.Page(request)) {
      const std::optional<StoredDocument> stored = FindDocument(writer_, tree_, id);
      if (stored.has_value()) take(LoadEntry(*stored, request.fields));
    }
    return;
  }
  PathWalk walk(writer_, tree_, request.prefix, request.after);
  for (int64_t left = request.limit; left != 0 && walk.Next(); --left) take(LoadEntry(walk.Document(), request.fields));
}

void SqliteStore::ClearSome() {
  if (Uncleared() == 0 || in_transaction_) return;
  Begin();
  clearing_.Turn();
  Commit();
  if (Uncleared() > 0 || !suggestions_wanted_) return;
  RebuildSuggestions();
  Commit();
}

/// Words of documents that are to be cleared would be counted: it waits for their end.
void SqliteStore::RebuildSuggestions() {
  suggestions_wanted_ = Uncleared() > 0;
  if (suggestions_wanted_) return;
  Begin();
  texts_.Flush();
  engine::RebuildSuggestions(writer_);
  uncommitted_bytes_ += 1;  // so that there is something to commit
}

/// The places that searches use, and the order of a listing that ended before its last page.
std::optional<std::chrono::steady_clock::time_point> SqliteStore::NextGiveBack() const {
  const auto places = readers_.SharedPlaces().NextGiveBack();
  const auto listed = listed_.Used();
  if (!listed.has_value()) return places;
  const auto end = *listed + PlacesCache::kIdle;
  return places.has_value() ? std::min(*places, end) : end;
}

void SqliteStore::GiveBack(std::chrono::steady_clock::time_point now) {
  readers_.SharedPlaces().GiveBack(now);
  if (const auto listed = listed_.Used(); listed.has_value() && now >= *listed + PlacesCache::kIdle) listed_.Forget();
}

StoreStat SqliteStore::Stat() { return ReadStat(readers_); }

}  // namespace ferrox::engine
