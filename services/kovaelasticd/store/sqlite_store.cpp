#include "services/kovaelasticd/store/sqlite_store.h"

#include <sys/stat.h>

#include <algorithm>

#include "common/file_util.h"
#include "services/kovaelasticd/search/sqlite_search.h"
#include "services/kovaelasticd/store/index_files.h"
#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/suggest.h"

namespace ferrox::engine {

namespace {

/// The write-ahead log is cut after a transaction that made it longer than this many bytes.
constexpr int64_t kLogMaxBytes = 16 << 20;
/// What a change counts for besides its text, in bytes, until the next automatic commit.
constexpr int64_t kRowBytes = 512;
/// How many documents DeletePrefix holds in memory at a time.
constexpr int kDeleteStep = 1000;

int64_t BytesOnDisk(const std::string& path) {
  struct stat status = {};
  return stat(path.c_str(), &status) == 0 ? int64_t{status.st_blocks} * 512 : 0;
}

Database::Mode OpeningMode(const std::string& path, bool create) {
  return create && !IsFileExist(path) ? Database::Mode::kCreate : Database::Mode::kWrite;
}

std::string_view TextOf(const Json::Value& document) {
  const Json::Value& text = document[field::kTextContent];
  const char* begin = nullptr;
  const char* end = nullptr;
  if (!text.isString() || !text.getString(&begin, &end)) return {};
  return {begin, static_cast<size_t>(end - begin)};
}

/// The tokenizer would take a text that begins with one of its marks for one that is cut into words already.
std::string_view WithoutMarks(std::string_view text) {
  while (!text.empty() && (text.front() == kGramsMark || text.front() == kReadyMark)) text.remove_prefix(1);
  return text;
}

}  // namespace

IndexStore::~IndexStore() = default;

SqliteStore::SqliteStore(const std::string& path, bool create, std::shared_ptr<const Schema> schema)
    : schema_(std::move(schema)), writer_(path, OpeningMode(path, create)), readers_(path) {
  PrepareStore(writer_, create);
  links_.MakeTables();
  LoadFieldNames(writer_, names_);
  totals_ = LoadTotals(writer_);
  SyncIndexFolder(Dirname(path));
}

SqliteStore::~SqliteStore() = default;

void SqliteStore::Begin() {
  if (in_transaction_) return;
  writer_.Execute("BEGIN IMMEDIATE");
  in_transaction_ = true;
}

void SqliteStore::Commit() {
  if (!in_transaction_) return;
  texts_.Flush();
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
  names_ = FieldNames();
  LoadFieldNames(writer_, names_);
  totals_ = LoadTotals(writer_);
}

void SqliteStore::LimitPages(int64_t pages) {
  (void)writer_.QueryInt(("PRAGMA max_page_count = " + std::to_string(pages == 0 ? 4294967294 : pages)).c_str());
}

void SqliteStore::CountText(int64_t before, int64_t after) {
  totals_.text_bytes += after - before;
  totals_.with_content += (after > 0 ? 1 : 0) - (before > 0 ? 1 : 0);
}

/// To be called after each change, with the bytes of text that it changed.
void SqliteStore::Changed(int64_t bytes) {
  uncommitted_bytes_ += bytes + kRowBytes;
  texts_.Changed(bytes);
}

int64_t SqliteStore::InsertRow(const DocRow& row, int64_t text_bytes) {
  Statement statement = writer_.Prepare("INSERT INTO docs VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11)");
  statement.BindNull(1);
  BindRow(statement, row, text_bytes);
  statement.Run();
  ++totals_.documents;
  CountText(0, text_bytes);
  return sqlite3_last_insert_rowid(writer_.Handle());
}

void SqliteStore::UpdateRow(int64_t id, const DocRow& row, int64_t text_bytes) {
  Statement statement = writer_.Prepare(
      "UPDATE docs SET path = ?2, name = ?3, ext = ?4, kind = ?5, size = ?6, mtime = ?7, text_bytes = ?8,"
      " derived = ?9, error = ?10, packed = ?11 WHERE id = ?1");
  statement.Bind(1, id);
  BindRow(statement, row, text_bytes);
  statement.Run();
}

void SqliteStore::Upsert(const std::string& path, const Json::Value& document) {
  Begin();
  AddFieldNames(writer_, names_, document);
  const std::string_view text = WithoutMarks(TextOf(document));
  const DocRow row = PackDocument(path, document, names_);
  const auto text_bytes = static_cast<int64_t>(text.size());
  const std::optional<StoredDocument> before = FindDocument(writer_, path);
  MetaText meta = MakeMetaText(row, document, *schema_);
  if (before.has_value()) {
    texts_.Replace(*before, std::move(meta), text);
    UpdateRow(before->id, row, text_bytes);
    CountText(before->text_bytes, text_bytes);
    links_.OnChange(before->id, &before->row, &row);
  } else {
    const int64_t id = InsertRow(row, text_bytes);
    texts_.Add(id, std::move(meta), text);
    links_.OnChange(id, nullptr, &row);
  }
  Changed(text_bytes);
}

void SqliteStore::Set(const std::string& path, const Json::Value& changes) {
  const std::optional<StoredDocument> before = FindDocument(writer_, path);
  if (!before.has_value()) throw Error(Error::kEngineNoSuchDocument, "there is no document \"" + path + "\" to change");
  Begin();
  AddFieldNames(writer_, names_, changes);
  Json::Value document = UnpackDocument(before->row, names_, {});
  for (auto member = changes.begin(); member != changes.end(); ++member) {
    if (member->isNull()) {
      document.removeMember(member.name());
    } else if (member.name() != field::kTextContent) {
      document[member.name()] = *member;
    }
  }
  const std::string new_path = document[field::kPath].isString() ? document[field::kPath].asString() : path;
  if (new_path != path) RemoveAt(new_path);
  const DocRow row = PackDocument(new_path, document, names_);
  const bool text_changed = changes.isMember(field::kTextContent);
  const std::string_view text = WithoutMarks(TextOf(changes));
  const int64_t text_bytes = text_changed ? static_cast<int64_t>(text.size()) : before->text_bytes;
  texts_.Replace(*before, MakeMetaText(row, document, *schema_), text_changed ? std::optional(text) : std::nullopt);
  UpdateRow(before->id, row, text_bytes);
  CountText(before->text_bytes, text_bytes);
  // A document that only moves says nothing new about its file.
  if (changes.isMember(FileLinks::kStamp)) links_.OnChange(before->id, &before->row, &row);
  Changed(text_changed ? text_bytes : 0);
}

/// Removes the document at `path`, if there is one.
void SqliteStore::RemoveAt(const std::string& path) {
  const std::optional<StoredDocument> there = FindDocument(writer_, path);
  if (there.has_value()) Remove(*there);
}

void SqliteStore::Remove(const StoredDocument& stored) {
  texts_.Remove(stored);
  writer_.Prepare("DELETE FROM docs WHERE id = ?1").Bind(1, stored.id).Run();
  links_.OnChange(stored.id, &stored.row, nullptr);
  --totals_.documents;
  CountText(stored.text_bytes, 0);
  Changed(stored.text_bytes);
}

void SqliteStore::Delete(const std::string& path) {
  Begin();
  RemoveAt(path);
}

void SqliteStore::DeletePrefix(const std::string& prefix) {
  Begin();
  static const std::string sql = std::string(kSelectRow) + "WHERE path >= ?1 AND path < ?2 LIMIT ?3";
  const PrefixRange range(prefix);
  std::vector<StoredDocument> found;
  do {
    found.clear();
    {
      Statement statement = writer_.Prepare(sql);
      range.Bind(statement);
      statement.Bind(3, int64_t{kDeleteStep});
      while (statement.Step()) found.push_back(ReadRow(statement));
    }
    for (const StoredDocument& stored : found) Remove(stored);
  } while (!found.empty());
}

Json::Value SqliteStore::LoadEntry(const StoredDocument& stored, const std::vector<std::string>& fields) {
  Json::Value entry = UnpackDocument(stored.row, names_, fields);
  const bool wants_text = std::find(fields.begin(), fields.end(), field::kTextContent) != fields.end();
  if (wants_text && stored.text_bytes > 0) entry[field::kTextContent] = texts_.Text(stored.id);
  return entry;
}

void SqliteStore::Get(const GetRequest& request, const std::function<void(const Json::Value&)>& take) {
  static const std::string sql =
      std::string(kSelectRow) + "WHERE path >= max(?1, ?3) AND path < ?2 AND path <> ?3 ORDER BY path LIMIT ?4";
  if (!request.term.empty()) {
    const std::optional<StoredDocument> stored = FindDocument(writer_, request.term);
    if (stored.has_value()) take(LoadEntry(*stored, request.fields));
    return;
  }
  if (request.suspects || request.unread || request.file != 0) {
    const char* condition = request.suspects ? "id IN (SELECT id FROM suspects)"
                            : request.unread ? "error IS NOT NULL"
                                             : "id IN (SELECT id FROM files WHERE file = ?3)";
    Statement statement =
        writer_.Prepare(std::string(kSelectRow) + "WHERE " + condition + " AND path > ?1 ORDER BY path LIMIT ?2");
    statement.Bind(1, std::string_view(request.after)).Bind(2, request.limit);
    if (!request.suspects && !request.unread) statement.Bind(3, static_cast<int64_t>(request.file));
    while (statement.Step()) take(LoadEntry(ReadRow(statement), request.fields));
    return;
  }
  Statement statement = writer_.Prepare(sql);
  const PrefixRange range(request.prefix);  // the statement refers to its texts
  range.Bind(statement);
  statement.Bind(3, std::string_view(request.after)).Bind(4, request.limit);
  while (statement.Step()) take(LoadEntry(ReadRow(statement), request.fields));
}

void SqliteStore::RebuildSuggestions() {
  Begin();
  texts_.Flush();
  engine::RebuildSuggestions(writer_);
  uncommitted_bytes_ += 1;  // so that there is something to commit
}

StoreStat SqliteStore::Stat() {
  StoreStat stat;
  std::unique_ptr<StoreReader> reader = readers_.Borrow();
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
  readers_.Return(std::move(reader));
  for (const char* suffix : {"", "-wal", "-shm"}) {
    stat.bytes_on_disk += BytesOnDisk(writer_.Path() + suffix);
  }
  return stat;
}

SearchReply SqliteStore::Search(const SearchRequest& request) {
  std::unique_ptr<StoreReader> reader = readers_.Borrow();
  reader->database.Execute("BEGIN");
  LoadFieldNames(reader->database, reader->names);
  SearchReply reply = Searcher(*reader, request).Run();
  reader->database.Execute("COMMIT");
  readers_.Return(std::move(reader));
  return reply;
}

}  // namespace ferrox::engine
