#include "services/kovaelasticd/store/sqlite_words.h"

#include "services/kovaelasticd/store/suggest.h"

namespace ferrox::engine {

namespace {

/// How many bytes of text may wait. New documents only have higher numbers than those written before, so they are
/// written in small amounts, and callers that wait for the index's thread wait less. A Flush that begins with a lower
/// number makes the full-text tables write out what they have gathered, so changes of old documents wait longer.
constexpr int64_t kPendingMaxBytes = 16 << 20;
constexpr int64_t kPendingNewMaxBytes = 2 << 20;

const std::string kNoText;

std::optional<std::string> TextOrNone(std::string_view text) {
  return text.empty() ? std::nullopt : std::optional<std::string>(text);
}

}  // namespace

/// The document's entry, made from what is stored when it has none.
SqliteWords::Pending& SqliteWords::PendingOf(const StoredDocument& stored) {
  const auto [place, made] = pending_.try_emplace(stored.id);
  if (made) {
    const Json::Value document = UnpackDocument(stored.row, names_, {});
    place->second.old_meta = MakeMetaText(stored.row, document, *schema_);
    place->second.new_meta = place->second.old_meta;
  }
  return place->second;
}

void SqliteWords::Add(int64_t id, MetaText meta, std::string_view text) {
  // A number may be that of a document removed just now, whose words are still to be removed.
  Pending& pending = pending_[id];
  pending.new_meta = std::move(meta);
  pending.text_changed = true;
  pending.text = TextOrNone(text);
}

void SqliteWords::Replace(const StoredDocument& before, MetaText meta, std::optional<std::string_view> text) {
  Pending& pending = PendingOf(before);
  pending.new_meta = std::move(meta);
  if (text.has_value()) {
    pending.text_changed = true;
    pending.text = TextOrNone(*text);
  } else if (!pending.text_changed && pending.new_meta == pending.old_meta) {
    pending_.erase(before.id);
  }
}

void SqliteWords::Remove(const StoredDocument& before) {
  Pending& pending = PendingOf(before);
  pending.new_meta.reset();
  pending.text_changed = true;
  pending.text.reset();
}

void SqliteWords::Changed(int64_t bytes) {
  pending_bytes_ += bytes;
  const bool ids_grow = !pending_.empty() && pending_.begin()->first > last_written_;
  if (pending_bytes_ >= (ids_grow ? kPendingNewMaxBytes : kPendingMaxBytes)) Flush();
}

std::string SqliteWords::Text(int64_t id) {
  const auto waiting = pending_.find(id);
  const bool waits = waiting != pending_.end() && waiting->second.text_changed;
  return waits ? waiting->second.text.value_or("") : StoredText(id);
}

std::string SqliteWords::StoredText(int64_t id) {
  Statement statement = database_.Prepare("SELECT zstd FROM bodies WHERE id = ?1");
  statement.Bind(1, id);
  return statement.Step() ? std::string(codec_.Unpack(statement.Text(0))) : std::string();
}

void SqliteWords::Flush() {
  for (const auto& [id, pending] : pending_) {
    if (pending.ChangesContent()) WriteText(id, pending);
  }
  for (const auto& [id, pending] : pending_) WriteMeta(id, pending);
  if (!pending_.empty()) last_written_ = pending_.rbegin()->first;
  pending_.clear();
  pending_bytes_ = 0;
}

void SqliteWords::Forget() {
  pending_.clear();
  pending_bytes_ = 0;
  purges_.reset();
}

void SqliteWords::RebuildSuggestions() { engine::RebuildSuggestions(database_); }

Words::Purged SqliteWords::Purge(const DocSet& documents, int64_t pages) {
  if (purges_ == nullptr) purges_ = std::make_unique<Purges>(database_);
  WordPurge::Result result = purges_->content.Turn(documents, pages);
  if (result == WordPurge::Result::kDone) result = purges_->meta.Turn(documents, pages);
  if (result != WordPurge::Result::kUnknownFormat)
    return result == WordPurge::Result::kDone ? Purged::kDone : Purged::kMore;
  purges_.reset();
  return Purged::kImpossible;
}

void SqliteWords::RemovePurged(int64_t id) { database_.Prepare("DELETE FROM bodies WHERE id = ?1").Bind(1, id).Run(); }

/// The old text is in "bodies" still, which is what the full-text table was given.
void SqliteWords::WriteText(int64_t id, const Pending& pending) {
  const std::string before = pending.old_meta.has_value() ? StoredText(id) : "";
  const std::string& text = pending.text_changed ? (pending.text.has_value() ? *pending.text : kNoText) : before;
  const bool same_language = pending.old_meta.has_value() && pending.new_meta.has_value() &&
                             pending.old_meta->language == pending.new_meta->language;
  if (before == text && same_language) return;
  if (!before.empty()) InsertText(id, pending.old_meta->language, before, true);
  if (!before.empty() && before != text) RemovePurged(id);
  if (text.empty()) return;
  InsertText(id, pending.new_meta->language, text, false);
  if (before == text) return;
  Statement store = database_.Prepare("INSERT INTO bodies(id, zstd) VALUES(?1, ?2)");
  store.Bind(1, id).BindBlob(2, codec_.Pack(text)).Run();
}

/// Adds words to the full-text table, or removes them: both are insertions, the latter with the command 'delete'.
void SqliteWords::InsertText(int64_t id, Language language, std::string_view text, bool remove) {
  const std::string prose = ProseMark(language).append(text);
  Statement statement =
      database_.Prepare(remove ? "INSERT INTO content_fts(content_fts, rowid, body) VALUES('delete', ?1, ?2)"
                               : "INSERT INTO content_fts(rowid, body) VALUES(?1, ?2)");
  statement.Bind(1, id).Bind(2, std::string_view(prose)).Run();
}

void SqliteWords::WriteMeta(int64_t id, const Pending& pending) {
  if (pending.old_meta == pending.new_meta) return;
  if (pending.old_meta.has_value()) InsertMeta(id, *pending.old_meta, true);
  if (pending.new_meta.has_value()) InsertMeta(id, *pending.new_meta, false);
}

/// Likewise.
void SqliteWords::InsertMeta(int64_t id, const MetaText& meta, bool remove) {
  Statement statement = database_.Prepare(
      remove ? "INSERT INTO meta_fts(meta_fts, rowid, grams, name, title, text, fields)"
               " VALUES('delete', ?1, ?2, ?3, ?4, ?5, ?6)"
             : "INSERT INTO meta_fts(rowid, grams, name, title, text, fields) VALUES(?1, ?2, ?3, ?4, ?5, ?6)");
  statement.Bind(1, id).Bind(2, std::string_view(meta.grams)).Bind(3, std::string_view(meta.name));
  statement.Bind(4, std::string_view(meta.title)).Bind(5, std::string_view(meta.text));
  statement.Bind(6, std::string_view(meta.fields)).Run();
}

}  // namespace ferrox::engine
