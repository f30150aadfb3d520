#include "services/kovaelasticd/search/path_condition.h"

#include "services/kovaelasticd/store/older_format.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// The most documents whose rows are read, and the most folders that are listed, while the places are not in memory;
/// each takes some microseconds.
constexpr int64_t kOneByOneMax = 200;
constexpr size_t kFoldersListedMax = 200;
/// How many places of documents are looked through in the time that the listing of one folder takes.
constexpr size_t kPlacesForAFolder = 4096;

}  // namespace

PathCondition::PathCondition(StoreReader& reader, int64_t version, const std::string& path)
    : reader_(reader), version_(version), path_(path), folder_(reader.tree.Find(path + "/")) {
  const std::optional<StoredDocument> itself = FindDocument(reader_.database, reader_.tree, path);
  if (itself.has_value()) itself_ = itself->id;
}

std::optional<std::vector<int64_t>> PathCondition::FewFolders(size_t most) {
  if (folder_ == FolderTree::kNone) return std::vector<int64_t>();
  return reader_.tree.AtAndBelow(folder_, most);
}

DocSet PathCondition::DocumentsIn(const std::vector<int64_t>& folders) {
  DocSet found;
  if (itself_ >= 0) found.Add(itself_);
  AddDocumentsIn(reader_.database, folders, found);
  return found;
}

DocSet PathCondition::AllDocuments() {
  if (reader_.tree.IsFlat()) return DocumentsAtWholePath(reader_.database, path_);
  std::shared_ptr<const Places> places;
  if (reader_.places.IsLoaded()) places = reader_.places.Load(reader_.database, version_);
  const size_t most = places == nullptr ? kFoldersListedMax : places->Documents().End() / kPlacesForAFolder + 1;
  if (const auto folders = FewFolders(most); folders.has_value()) return DocumentsIn(*folders);
  if (places == nullptr) places = reader_.places.Load(reader_.database, version_);
  FoldersBelow below(*places, {folder_});
  DocSet found;
  const auto end = static_cast<int64_t>(places->Documents().End());
  for (int64_t id = 0; id < end; ++id) {
    if (below.Contains(places->Documents().At(static_cast<size_t>(id)).folder)) found.Add(id);
  }
  if (itself_ >= 0) found.Add(itself_);
  return found;
}

void PathCondition::Apply(DocSet& documents, bool wanted) {
  const auto combine = [&](const DocSet& found) {
    wanted ? documents.IntersectWith(found) : documents.Subtract(found);
  };
  const auto keep = [&](const auto& holds) {
    documents.RemoveIf([&](int64_t id) { return (id == itself_ || holds(id)) != wanted; });
  };
  if (reader_.tree.IsFlat()) return combine(DocumentsAtWholePath(reader_.database, path_));
  if (!reader_.places.IsLoaded()) {
    if (documents.Count() <= kOneByOneMax) return keep([this](int64_t id) { return HoldsByRow(id); });
    if (const auto folders = FewFolders(kFoldersListedMax); folders.has_value()) return combine(DocumentsIn(*folders));
  }
  const std::shared_ptr<const Places> places = reader_.places.Load(reader_.database, version_);
  FoldersBelow below(*places, {folder_});
  keep([&](int64_t id) { return below.Contains(places->Documents().At(static_cast<size_t>(id)).folder); });
}

bool PathCondition::HoldsByRow(int64_t id) {
  Statement row = reader_.database.Prepare("SELECT folder FROM docs WHERE id = ?1");
  return row.Bind(1, id).Step() && reader_.tree.IsAtOrBelow(row.Int(0), folder_);
}

}  // namespace ferrox::engine
