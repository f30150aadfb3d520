// What changes the documents of a SqliteStore.
#include <algorithm>

#include "common/file_util.h"
#include "services/kovaelasticd/store/path_walk.h"
#include "services/kovaelasticd/store/sqlite_store.h"

namespace ferrox::engine {

namespace {

/// What a change counts for besides its text, in bytes, until the next automatic commit.
constexpr int64_t kRowBytes = 512;
/// How many documents are held in memory at a time, to be removed or moved.
constexpr size_t kStep = 1000;

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

void SqliteStore::CountText(int64_t before, int64_t after) {
  totals_.text_bytes += after - before;
  totals_.with_content += (after > 0 ? 1 : 0) - (before > 0 ? 1 : 0);
}

/// To be called after each change, with the bytes of text that it changed.
void SqliteStore::Changed(int64_t bytes) {
  uncommitted_bytes_ += bytes + kRowBytes;
  texts_.Changed(bytes);
  if (places_.IsFull()) places_.Flush(totals_.version + 1);
}

int64_t SqliteStore::InsertRow(const DocRow& row, int64_t text_bytes) {
  Statement statement =
      writer_.Prepare("INSERT INTO docs VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12, ?13)");
  const int64_t id = ++totals_.last_id;
  statement.Bind(1, id);
  BindRow(statement, tree_.Make(FolderTree::FolderOf(row.path)), row, text_bytes);
  statement.Run();
  ++totals_.documents;
  CountText(0, text_bytes);
  CountAccess(nullptr, &row);
  return id;
}

void SqliteStore::UpdateRow(const StoredDocument& before, const DocRow& row, int64_t text_bytes) {
  const int64_t folder = tree_.Make(FolderTree::FolderOf(row.path));
  Statement statement = writer_.Prepare(
      "UPDATE docs SET folder = ?2, leaf = ?3, name = ?4, ext = ?5, kind = ?6, size = ?7, mtime = ?8, text_bytes = ?9,"
      " derived = ?10, error = ?11, packed = ?12, access = ?13 WHERE id = ?1");
  statement.Bind(1, before.id);
  BindRow(statement, folder, row, text_bytes);
  statement.Run();
  if (folder != before.folder) tree_.Prune(before.folder);
  CountAccess(&before.row, &row);
}

void SqliteStore::Upsert(const std::string& path, const Json::Value& document) {
  Begin();
  AddFieldNames(writer_, names_, document);
  const std::string_view text = WithoutMarks(TextOf(document));
  DocRow row = PackDocument(path, document, names_);
  row.access = access_.NumberOf(document[field::kAccess]);
  const auto text_bytes = static_cast<int64_t>(text.size());
  const std::optional<StoredDocument> before = FindDocument(writer_, tree_, path);
  MetaText meta = MakeMetaText(row, document, *schema_);
  if (before.has_value()) {
    texts_.Replace(*before, std::move(meta), text);
    UpdateRow(*before, row, text_bytes);
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
  const std::optional<StoredDocument> before = FindDocument(writer_, tree_, path);
  if (!before.has_value()) throw Error(Error::kEngineNoSuchDocument, "there is no document \"" + path + "\" to change");
  Begin();
  const int64_t access =
      changes.isMember(field::kAccess) ? access_.NumberOf(changes[field::kAccess]) : before->row.access;
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
  DocRow row = PackDocument(new_path, document, names_);
  row.access = access;
  const bool text_changed = changes.isMember(field::kTextContent);
  const std::string_view text = WithoutMarks(TextOf(changes));
  const int64_t text_bytes = text_changed ? static_cast<int64_t>(text.size()) : before->text_bytes;
  texts_.Replace(*before, MakeMetaText(row, document, *schema_), text_changed ? std::optional(text) : std::nullopt);
  UpdateRow(*before, row, text_bytes);
  CountText(before->text_bytes, text_bytes);
  // A document that only moves says nothing new about its file.
  if (changes.isMember(FileLinks::kStamp)) links_.OnChange(before->id, &before->row, &row);
  Changed(text_changed ? text_bytes : 0);
}

void SqliteStore::MoveFolder(const std::string& path, const std::string& stamp, const Json::Value& changes) {
  if (!stamp.empty()) {
    const std::optional<StoredDocument> there = FindDocument(writer_, tree_, path);
    const bool same =
        there.has_value() && UnpackDocument(there->row, names_, {FileLinks::kStamp})[FileLinks::kStamp] == stamp;
    if (!same)
      throw Error(Error::kEngineNoSuchDocument, "there is no document \"" + path + "\" with that stamp to move");
  }
  Set(path, changes);
  const std::string from = path + "/", to = changes[field::kPath].asString() + "/";
  const int64_t folder = tree_.Find(from);
  if (folder == FolderTree::kNone) return;
  tree_.Find(to) == FolderTree::kNone ? tree_.Move(folder, to) : MoveOneByOne(from, to);
}

/// Where both folders have documents below them, one may take another's place.
void SqliteStore::MoveOneByOne(const std::string& from, const std::string& to) {
  std::vector<std::string> paths;
  do {
    paths.clear();
    PathWalk walk(writer_, tree_, from, "");
    while (paths.size() < kStep && walk.Next()) paths.push_back(walk.Document().row.path);
    Json::Value change;
    for (const std::string& path : paths) {
      const std::string new_path = to + path.substr(from.size());
      change[field::kPath] = new_path;
      change[field::kParent] = Dirname(new_path);
      Set(path, change);
    }
  } while (!paths.empty());
}

/// Removes the document at `path`, if there is one.
void SqliteStore::RemoveAt(const std::string& path) {
  const std::optional<StoredDocument> there = FindDocument(writer_, tree_, path);
  if (there.has_value()) Remove(*there);
}

void SqliteStore::Remove(const StoredDocument& stored) {
  texts_.Remove(stored);
  writer_.Prepare("DELETE FROM docs WHERE id = ?1").Bind(1, stored.id).Run();
  tree_.Prune(stored.folder);
  links_.OnChange(stored.id, &stored.row, nullptr);
  --totals_.documents;
  CountAccess(&stored.row, nullptr);
  CountText(stored.text_bytes, 0);
  Changed(stored.text_bytes);
}

void SqliteStore::Delete(const std::string& path) {
  Begin();
  RemoveAt(path);
}

void SqliteStore::DeletePrefix(const std::string& prefix) {
  Begin();
  const int64_t folder = tree_.Find(FolderTree::FolderOf(prefix));
  if (folder == FolderTree::kNone) return;
  const std::string begin(FolderTree::LeafOf(prefix));
  const bool whole = begin.empty() && folder != FolderTree::kTop;
  for (const int64_t each : whole ? std::vector<int64_t>{folder} : tree_.ChildrenOf(folder, begin)) {
    if (!clearing_.IsLarge(each)) continue;
    clearing_.TakeOut(each);
    Changed(0);
  }
  RemoveOneByOne(prefix);
}

void SqliteStore::RemoveOneByOne(const std::string& prefix) {
  std::vector<StoredDocument> found;
  do {
    found.clear();
    PathWalk walk(writer_, tree_, prefix, "");
    while (found.size() < kStep && walk.Next()) found.push_back(walk.Document());
    for (const StoredDocument& stored : found) Remove(stored);
  } while (!found.empty());
}

}  // namespace ferrox::engine
