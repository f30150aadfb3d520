#include <algorithm>

#include "common/log.h"
#include "services/kovaelasticd/fts.h"
#include "services/kovaelasticd/sqlite_store.h"

namespace ferrox::engine {

namespace {

/// Texts wait in so much memory for the full-text tables. These take rows at any time as long as ids only grow, as
/// those of new documents do, and then short turns leave readers of files less to wait for; a lower id makes them
/// write out what they have gathered.
constexpr int64_t kPendingMaxBytes = 16 << 20;
constexpr int64_t kPendingNewMaxBytes = 2 << 20;
/// What a change costs besides its text.
constexpr int64_t kRowBytes = 512;
/// More names than that come from no extractor.
constexpr int64_t kFieldNamesMax = 4096;
constexpr int kDeleteStep = 1000;

std::string_view TextOf(const Json::Value& document) {
  const Json::Value& text = document[field::kTextContent];
  const char* begin = nullptr;
  const char* end = nullptr;
  if (!text.isString() || !text.getString(&begin, &end)) return {};
  return {begin, static_cast<size_t>(end - begin)};
}

/// The full-text index would take a text that begins so for one that is cut already.
std::string_view WithoutMarks(std::string_view text) {
  while (!text.empty() && (text.front() == kGramsMark || text.front() == kReadyMark)) text.remove_prefix(1);
  return text;
}

}  // namespace

void SqliteStore::AddFieldNames(const Json::Value& document) {
  for (const std::string& name : NamesNeeded(document, names_)) {
    const int64_t number = names_.Largest() + 1;
    FERROX_FAIL_IF(number > kFieldNamesMax, Error::kEngineBadRequest,
                   "field \"" + name + "\" is one too many: an index holds at most " + std::to_string(kFieldNamesMax) +
                       " different field names");
    writer_.Prepare("INSERT INTO fields(number, name) VALUES(?1, ?2)")
        .Bind(1, number)
        .Bind(2, std::string_view(name))
        .Run();
    names_.Add(number, name);
  }
}

/// The document's place among those whose words must be brought up to date, made when it has none.
SqliteStore::Pending& SqliteStore::Touch(const StoredDocument& stored) {
  const auto [place, made] = pending_.try_emplace(stored.id);
  if (made) {
    const Json::Value document = UnpackDocument(stored.row, names_, {});
    place->second.old_meta = MakeMetaText(stored.row, document, *schema_);
    place->second.new_meta = place->second.old_meta;
  }
  return place->second;
}

void SqliteStore::CountText(int64_t before, int64_t after) {
  totals_.text_bytes += after - before;
  totals_.with_content += (after > 0 ? 1 : 0) - (before > 0 ? 1 : 0);
}

void SqliteStore::Changed(int64_t bytes) {
  pending_bytes_ += bytes;
  uncommitted_bytes_ += bytes + kRowBytes;
  const bool ids_grow = !pending_.empty() && pending_.begin()->first > last_flushed_;
  if (pending_bytes_ >= (ids_grow ? kPendingNewMaxBytes : kPendingMaxBytes)) Flush();
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
  AddFieldNames(document);
  const std::string_view text = WithoutMarks(TextOf(document));
  const DocRow row = PackDocument(path, document, names_);
  const auto text_bytes = static_cast<int64_t>(text.size());
  const std::optional<StoredDocument> before = FindDocument(writer_, path);
  Pending* pending = nullptr;
  if (before.has_value()) {
    pending = &Touch(*before);
    UpdateRow(before->id, row, text_bytes);
    CountText(before->text_bytes, text_bytes);
    links_.OnChange(before->id, &before->row, &row);
  } else {
    const int64_t id = InsertRow(row, text_bytes);
    pending = &pending_[id];
    links_.OnChange(id, nullptr, &row);
  }
  pending->new_meta = MakeMetaText(row, document, *schema_);
  pending->text_changed = true;
  pending->text = text.empty() ? std::nullopt : std::optional<std::string>(text);
  Changed(text_bytes);
}

void SqliteStore::Set(const std::string& path, const Json::Value& changes) {
  const std::optional<StoredDocument> before = FindDocument(writer_, path);
  if (!before.has_value()) throw Error(Error::kEngineNoSuchDocument, "there is no document \"" + path + "\" to change");
  Begin();
  AddFieldNames(changes);
  Json::Value document = UnpackDocument(before->row, names_, {});
  for (auto member = changes.begin(); member != changes.end(); ++member) {
    if (member->isNull()) {
      document.removeMember(member.name());
    } else if (member.name() != field::kTextContent) {
      document[member.name()] = *member;
    }
  }
  const std::string new_path = document[field::kPath].isString() ? document[field::kPath].asString() : path;
  if (new_path != path) MoveAway(new_path);
  const DocRow row = PackDocument(new_path, document, names_);
  const bool text_changed = changes.isMember(field::kTextContent);
  const std::string_view text = WithoutMarks(TextOf(changes));
  const int64_t text_bytes = text_changed ? static_cast<int64_t>(text.size()) : before->text_bytes;
  Pending& pending = Touch(*before);
  UpdateRow(before->id, row, text_bytes);
  CountText(before->text_bytes, text_bytes);
  // A document that only moves was not looked at.
  if (changes.isMember(FileLinks::kStamp)) links_.OnChange(before->id, &before->row, &row);
  pending.new_meta = MakeMetaText(row, document, *schema_);
  if (text_changed) {
    pending.text_changed = true;
    pending.text = text.empty() ? std::nullopt : std::optional<std::string>(text);
  } else if (!pending.text_changed && pending.new_meta == pending.old_meta) {
    pending_.erase(before->id);
  }
  Changed(text_changed ? text_bytes : 0);
}

/// Makes room at a path that another document moves to.
void SqliteStore::MoveAway(const std::string& path) {
  const std::optional<StoredDocument> there = FindDocument(writer_, path);
  if (there.has_value()) Remove(*there);
}

void SqliteStore::Remove(const StoredDocument& stored) {
  Pending& pending = Touch(stored);
  pending.new_meta.reset();
  pending.text_changed = true;
  pending.text.reset();
  writer_.Prepare("DELETE FROM docs WHERE id = ?1").Bind(1, stored.id).Run();
  links_.OnChange(stored.id, &stored.row, nullptr);
  --totals_.documents;
  CountText(stored.text_bytes, 0);
  Changed(stored.text_bytes);
}

void SqliteStore::Delete(const std::string& path) {
  Begin();
  MoveAway(path);
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
  if (wants_text && stored.text_bytes > 0) {
    const auto waiting = pending_.find(stored.id);
    const bool waits = waiting != pending_.end() && waiting->second.text_changed;
    entry[field::kTextContent] = waits ? waiting->second.text.value_or("") : StoredText(stored.id);
  }
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

std::string SqliteStore::StoredText(int64_t id) {
  Statement statement = writer_.Prepare("SELECT zstd FROM bodies WHERE id = ?1");
  statement.Bind(1, id);
  return statement.Step() ? std::string(codec_.Unpack(statement.Text(0))) : std::string();
}

void SqliteStore::Flush() {
  for (const auto& [id, pending] : pending_) {
    if (pending.text_changed) FlushText(id, pending);
  }
  for (const auto& [id, pending] : pending_) FlushMeta(id, pending);
  if (!pending_.empty()) last_flushed_ = pending_.rbegin()->first;
  pending_.clear();
  pending_bytes_ = 0;
}

void SqliteStore::FlushText(int64_t id, const Pending& pending) {
  if (pending.old_meta.has_value()) {
    const std::string before = StoredText(id);
    if (before == pending.text.value_or("")) return;
    if (!before.empty()) {
      Statement remove = writer_.Prepare("INSERT INTO content_fts(content_fts, rowid, body) VALUES('delete', ?1, ?2)");
      remove.Bind(1, id).Bind(2, std::string_view(before)).Run();
      writer_.Prepare("DELETE FROM bodies WHERE id = ?1").Bind(1, id).Run();
    }
  }
  if (!pending.text.has_value()) return;
  Statement insert = writer_.Prepare("INSERT INTO content_fts(rowid, body) VALUES(?1, ?2)");
  insert.Bind(1, id).Bind(2, std::string_view(*pending.text)).Run();
  Statement store = writer_.Prepare("INSERT INTO bodies(id, zstd) VALUES(?1, ?2)");
  store.Bind(1, id).BindBlob(2, codec_.Pack(*pending.text)).Run();
}

void SqliteStore::FlushMeta(int64_t id, const Pending& pending) {
  if (pending.old_meta == pending.new_meta) return;
  if (pending.old_meta.has_value()) WriteMeta(id, *pending.old_meta, true);
  if (pending.new_meta.has_value()) WriteMeta(id, *pending.new_meta, false);
}

void SqliteStore::WriteMeta(int64_t id, const MetaText& meta, bool remove) {
  Statement statement = writer_.Prepare(
      remove ? "INSERT INTO meta_fts(meta_fts, rowid, grams, name, title, text, fields)"
               " VALUES('delete', ?1, ?2, ?3, ?4, ?5, ?6)"
             : "INSERT INTO meta_fts(rowid, grams, name, title, text, fields) VALUES(?1, ?2, ?3, ?4, ?5, ?6)");
  statement.Bind(1, id).Bind(2, std::string_view(meta.grams)).Bind(3, std::string_view(meta.name));
  statement.Bind(4, std::string_view(meta.title)).Bind(5, std::string_view(meta.text));
  statement.Bind(6, std::string_view(meta.fields)).Run();
}

}  // namespace ferrox::engine
