#define FERROX_SOURCE "sqlite_store"

#include "services/kovaelasticd/store/catalogue.h"

#include "common/file_util.h"
#include "services/kovaelasticd/store/index_files.h"
#include "services/kovaelasticd/store/path_walk.h"
#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/store_stat.h"

namespace ferrox::engine {

namespace {

/// The write-ahead log is cut after a transaction that made it longer than this many bytes.
constexpr int64_t kLogMaxBytes = 16 << 20;
/// The same while documents are cleared: turns change the same pages of the columns' indexes again and again.
constexpr int64_t kClearingLogMaxBytes = 64 << 20;

Database::Mode OpeningMode(const std::string& path, bool create) {
  return create && !IsFileExist(path) ? Database::Mode::kCreate : Database::Mode::kWrite;
}

}  // namespace

Catalogue::Catalogue(const std::string& path, bool create) : database_(path, OpeningMode(path, create)) {
  PrepareStore(database_, create);
  links_.MakeTables();
  places_.MakeTable();
  places_.Forget();  // what an upgrade has changed is in there
  name_marks_.Load();
  LoadFieldNames(database_, names_);
  totals_ = LoadTotals(database_);
  SyncIndexFolder(Dirname(path));
}

void Catalogue::OnRow(RowWatch::Table table, int64_t number, bool is_update) {
  listed_.OnRow(table, number, is_update);
  places_.OnRow(table, number);
}

void Catalogue::Begin() {
  if (in_transaction_) return;
  database_.Execute("BEGIN IMMEDIATE");
  in_transaction_ = true;
}

void Catalogue::Commit() {
  places_.Flush(++totals_.version);
  totals_.preparing = totals_.preparing && totals_.without_access > 0;
  SaveTotals(database_, totals_);
  database_.Execute("COMMIT");
  in_transaction_ = false;
  ShortenLog();
}

/// After a large transaction, moves the write-ahead log into the database and cuts it, unless somebody reads it just
/// now. While documents are to be cleared SQLite does not do the former by itself at each commit.
void Catalogue::ShortenLog() {
  const bool clears = totals_.clearing > 0;
  (void)sqlite3_wal_autocheckpoint(database_.Handle(), clears ? 0 : kLogPages);
  if (BytesOnDisk(database_.Path() + "-wal") < (clears ? kClearingLogMaxBytes : kLogMaxBytes)) return;
  (void)sqlite3_busy_timeout(database_.Handle(), 0);
  const int result =
      sqlite3_wal_checkpoint_v2(database_.Handle(), nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  (void)sqlite3_busy_timeout(database_.Handle(), Database::kBusyTimeoutMs);
  database_.CheckDamage(result);  // what else fails is tried again with the next transaction
}

void Catalogue::Rollback() {
  in_transaction_ = false;
  // A failure may have ended the transaction already.
  if (sqlite3_get_autocommit(database_.Handle()) == 0) database_.Execute("ROLLBACK");
  tree_.Forget();
  access_.Forget();
  listed_.Forget();
  places_.Forget();
  name_marks_.Load();
  names_ = FieldNames();
  LoadFieldNames(database_, names_);
  totals_ = LoadTotals(database_);
}

void Catalogue::List(const GetRequest& request, const std::function<void(const StoredDocument&)>& take) {
  const auto take_if_there = [&take](const std::optional<StoredDocument>& stored) {
    if (stored.has_value()) take(*stored);
  };
  if (!request.term.empty()) return take_if_there(Find(request.term));
  if (request.suspects || request.unread || request.file != 0) {
    for (const int64_t id : listed_.Page(request)) take_if_there(FindDocument(database_, tree_, id));
    return;
  }
  if (!request.folder.empty()) return ListIn(request, take);
  PathWalk walk(database_, tree_, request.prefix, request.after);
  for (int64_t left = request.limit; left != 0 && walk.Next(); --left) take(walk.Document());
}

void Catalogue::ListIn(const GetRequest& request, const std::function<void(const StoredDocument&)>& take) {
  static const std::string from = std::string(kSelectRow) + "WHERE folder = ?1 AND leaf ";
  const int64_t folder = tree_.Find(request.folder);
  const bool goes_on = !request.after.empty();
  if (folder == FolderTree::kNone || (goes_on && FolderTree::FolderOf(request.after) != request.folder)) return;
  Statement rows = database_.Prepare(from + (goes_on ? ">" : ">=") + " ?2 ORDER BY leaf LIMIT ?3");
  rows.Bind(1, folder).Bind(2, FolderTree::LeafOf(request.after)).Bind(3, request.limit);
  while (rows.Step()) take(ReadRow(rows, request.folder));
}

void Catalogue::CountText(int64_t before, int64_t after) {
  totals_.text_bytes += after - before;
  totals_.with_content += (after > 0 ? 1 : 0) - (before > 0 ? 1 : 0);
}

/// For a row that is written (`before` null: it is new) or removed (`after` null): keeps the sum, and the record of the
/// folder whose own document it is.
void Catalogue::CountAccess(const DocRow* before, const DocRow* after) {
  const auto lacks = [](const DocRow* row) { return row != nullptr && row->access == AccessRecords::kNone ? 1 : 0; };
  totals_.without_access += lacks(after) - lacks(before);
  const bool was_folder = before != nullptr && before->kind == kFolder;
  const bool is_folder = after != nullptr && after->kind == kFolder;
  if (was_folder && !(is_folder && before->path == after->path)) GiveFolder(before->path, AccessRecords::kNone);
  if (is_folder) GiveFolder(after->path, after->access);
}

void Catalogue::GiveFolder(const std::string& path, int64_t access) {
  const int64_t folder = tree_.Find(path + "/");
  if (folder != FolderTree::kNone) tree_.SetAccess(folder, access);
}

int64_t Catalogue::Insert(const DocRow& row, int64_t text_bytes) {
  Statement statement =
      database_.Prepare("INSERT INTO docs VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12, ?13, ?14, ?15)");
  const int64_t id = ++totals_.last_id;
  statement.Bind(1, id);
  BindRow(statement, tree_.Make(FolderTree::FolderOf(row.path)), row, text_bytes);
  statement.Run();
  ++totals_.documents;
  CountText(0, text_bytes);
  CountAccess(nullptr, &row);
  links_.OnChange(id, nullptr, &row);
  return id;
}

void Catalogue::Update(const StoredDocument& before, const DocRow& row, int64_t text_bytes, bool seen) {
  const int64_t folder = tree_.Make(FolderTree::FolderOf(row.path));
  Statement statement = database_.Prepare(
      "UPDATE docs SET folder = ?2, leaf = ?3, name = ?4, ext = ?5, kind = ?6, size = ?7, mtime = ?8, text_bytes = ?9,"
      " derived = ?10, error = ?11, packed = ?12, access = ?13, language = ?14, title = ?15 WHERE id = ?1");
  statement.Bind(1, before.id);
  BindRow(statement, folder, row, text_bytes);
  statement.Run();
  if (folder != before.folder) tree_.Prune(before.folder);
  CountText(before.text_bytes, text_bytes);
  CountAccess(&before.row, &row);
  if (seen) links_.OnChange(before.id, &before.row, &row);
}

void Catalogue::Remove(const StoredDocument& stored) {
  database_.Prepare("DELETE FROM docs WHERE id = ?1").Bind(1, stored.id).Run();
  tree_.Prune(stored.folder);
  links_.OnChange(stored.id, &stored.row, nullptr);
  --totals_.documents;
  CountAccess(&stored.row, nullptr);
  CountText(stored.text_bytes, 0);
}

void Catalogue::Relieve() {
  if (places_.IsFull()) places_.Flush(totals_.version + 1);
}

}  // namespace ferrox::engine
