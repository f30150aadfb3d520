// What changes the documents of a SqliteStore.
#include <algorithm>

#include "common/file_util.h"
#include "services/kovaelasticd/store/path_walk.h"
#include "services/kovaelasticd/store/sqlite_store.h"
#include "services/kovaelasticd/text/language.h"
#include "services/kovaelasticd/text/title.h"

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

}  // namespace

void SqliteStore::Changed(int64_t bytes) {
  uncommitted_bytes_ += bytes + kRowBytes;
  words_.Changed(bytes);
  catalogue_.Relieve();
}

void SqliteStore::Upsert(const std::string& path, const Json::Value& document) {
  catalogue_.Begin();
  AddFieldNames(catalogue_.Connection(), catalogue_.Names(), document);
  const std::string_view text = TextOf(document);
  DocRow row = PackDocument(path, document, catalogue_.Names());
  row.access = catalogue_.Access().NumberOf(document[field::kAccess]);
  row.language = LanguageOf(document, text);
  row.title = TitleOf(text, row.ext);
  const auto text_bytes = static_cast<int64_t>(text.size());
  const std::optional<StoredDocument> before = catalogue_.Find(path);
  MetaText meta = MakeMetaText(row, document, *schema_);
  if (before.has_value()) {
    words_.Replace(*before, std::move(meta), text);
    catalogue_.Update(*before, row, text_bytes, true);
  } else {
    words_.Add(catalogue_.Insert(row, text_bytes), std::move(meta), text);
  }
  Changed(text_bytes);
}

void SqliteStore::Set(const std::string& path, const Json::Value& changes) {
  const std::optional<StoredDocument> before = catalogue_.Find(path);
  if (!before.has_value()) throw Error(Error::kEngineNoSuchDocument, "there is no document \"" + path + "\" to change");
  catalogue_.Begin();
  const int64_t access =
      changes.isMember(field::kAccess) ? catalogue_.Access().NumberOf(changes[field::kAccess]) : before->row.access;
  AddFieldNames(catalogue_.Connection(), catalogue_.Names(), changes);
  Json::Value document = UnpackDocument(before->row, catalogue_.Names(), {});
  for (auto member = changes.begin(); member != changes.end(); ++member) {
    if (member->isNull()) {
      document.removeMember(member.name());
    } else if (member.name() != field::kTextContent) {
      document[member.name()] = *member;
    }
  }
  const std::string new_path = document[field::kPath].isString() ? document[field::kPath].asString() : path;
  if (new_path != path) RemoveAt(new_path);
  DocRow row = PackDocument(new_path, document, catalogue_.Names());
  row.access = access;
  const bool text_changed = changes.isMember(field::kTextContent);
  const std::string_view text = TextOf(changes);
  row.title = text_changed ? TitleOf(text, row.ext) : before->row.title;
  row.language = before->row.language;
  if (text_changed || changes.isMember(field::kLanguages))
    row.language = LanguageOf(document, text_changed ? text : std::string_view(words_.Text(before->id)));
  const int64_t text_bytes = text_changed ? static_cast<int64_t>(text.size()) : before->text_bytes;
  words_.Replace(*before, MakeMetaText(row, document, *schema_), text_changed ? std::optional(text) : std::nullopt);
  // A document that only moves says nothing new about its file.
  catalogue_.Update(*before, row, text_bytes, changes.isMember(FileLinks::kStamp));
  Changed(text_changed ? text_bytes : 0);
}

void SqliteStore::MoveFolder(const std::string& path, const std::string& stamp, const Json::Value& changes) {
  if (!stamp.empty()) {
    const std::optional<StoredDocument> there = catalogue_.Find(path);
    const bool same = there.has_value() &&
                      UnpackDocument(there->row, catalogue_.Names(), {FileLinks::kStamp})[FileLinks::kStamp] == stamp;
    if (!same)
      throw Error(Error::kEngineNoSuchDocument, "there is no document \"" + path + "\" with that stamp to move");
  }
  Set(path, changes);
  const std::string from = path + "/", to = changes[field::kPath].asString() + "/";
  FolderTree& tree = catalogue_.Tree();
  const int64_t folder = tree.Find(from);
  if (folder == FolderTree::kNone) return;
  tree.Find(to) == FolderTree::kNone ? tree.Move(folder, to) : MoveOneByOne(from, to);
}

/// Where both folders have documents below them, one may take another's place.
void SqliteStore::MoveOneByOne(const std::string& from, const std::string& to) {
  std::vector<std::string> paths;
  do {
    paths.clear();
    PathWalk walk(catalogue_.Connection(), catalogue_.Tree(), from, "");
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
  const std::optional<StoredDocument> there = catalogue_.Find(path);
  if (there.has_value()) Remove(*there);
}

void SqliteStore::Remove(const StoredDocument& stored) {
  words_.Remove(stored);
  catalogue_.Remove(stored);
  Changed(stored.text_bytes);
}

void SqliteStore::Delete(const std::string& path) {
  catalogue_.Begin();
  RemoveAt(path);
}

void SqliteStore::DeletePrefix(const std::string& prefix) {
  catalogue_.Begin();
  FolderTree& tree = catalogue_.Tree();
  const int64_t folder = tree.Find(FolderTree::FolderOf(prefix));
  if (folder == FolderTree::kNone) return;
  const std::string begin(FolderTree::LeafOf(prefix));
  const bool whole = begin.empty() && folder != FolderTree::kTop;
  for (const int64_t each : whole ? std::vector<int64_t>{folder} : tree.ChildrenOf(folder, begin)) {
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
    PathWalk walk(catalogue_.Connection(), catalogue_.Tree(), prefix, "");
    while (found.size() < kStep && walk.Next()) found.push_back(walk.Document());
    for (const StoredDocument& stored : found) Remove(stored);
  } while (!found.empty());
}

}  // namespace ferrox::engine
