#include "services/kovaelasticd/search/folder_words.h"

#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/document.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/places.h"
#include "services/kovaelasticd/store/store_rows.h"
#include "services/kovaelasticd/store/work_limit.h"
#include "services/kovaelasticd/text/stems.h"

namespace ferrox::engine {

namespace {

/// So many documents may always be found, whatever part of all they are.
constexpr int64_t kAlwaysFound = 50;
/// The most folders that are looked at by their rows, each in some microseconds, while the places are not in memory;
/// else one for so many places that a pass over all would look at.
constexpr size_t kFoldersByRowMax = 200;
constexpr size_t kPlacesForARow = 4096;

std::string NameExpression(std::vector<std::string> words, bool prefix) {
  for (std::string& word : words) word.insert(0, std::string(kFolderNameField) + kFieldEnd);
  return PhraseExpression(words, prefix);
}

/// The own documents of the folders that are named so. Of all folders: which of them count is decided by what is below.
DocSet OwnDocuments(StoreReader& reader, const QueryWords& words) {
  std::string expression = NameExpression(words.words, words.prefix);
  if (words.words.size() == 1 && !words.prefix) {
    for (const std::string& stem : QueryStems(words.words[0])) expression += " OR " + NameExpression({stem}, false);
  }
  const Visible everything(reader, nullptr);
  HitCollector own(0, everything);
  Collect(reader.database, "meta_fts", "{fields} : (" + expression + ")", words.prefix, own);
  return own.TakeSet();
}

/// The lowest folder that holds all that is indexed. Above it is nothing but the folders on the way there; its own
/// document, where there is one, is the only one beside them.
int64_t RootOfAll(StoreReader& reader) {
  Statement documents = reader.database.Prepare("SELECT leaf || '/' FROM docs WHERE folder = ?1 LIMIT 2");
  Statement folders = reader.database.Prepare("SELECT id, name FROM folders WHERE parent = ?1 LIMIT 2");
  for (int64_t folder = FolderTree::kTop;;) {
    folders.Reset();
    if (!folders.Bind(1, folder).Step()) return folder;
    const int64_t below = folders.Int(0);
    const std::string name(folders.Text(1));
    if (folders.Step()) return folder;
    documents.Reset();
    const bool has_document = documents.Bind(1, folder).Step();
    if (has_document && (documents.Text(0) != name || documents.Step())) return folder;
    if (has_document) return below;
    folder = below;
  }
}

/// The folder that holds all that the search is about, and those above it.
std::vector<int64_t> WayToRoot(StoreReader& reader, const Visible& visible) {
  std::string path = visible.IsForAsker() ? visible.ShareRoot() : reader.tree.PathOf(RootOfAll(reader));
  std::vector<int64_t> way;
  for (;;) {
    while (path.ends_with('/')) path.pop_back();
    way.push_back(reader.tree.Find(path + "/"));
    if (path.empty()) return way;
    path = FolderTree::FolderOf(path);
  }
}

/// The folders that have these own documents, by rows.
std::vector<int64_t> FoldersByRows(Database& database, const DocSet& own) {
  std::vector<int64_t> folders;
  Statement row = database.Prepare(
      "SELECT folders.id FROM docs JOIN folders ON parent = folder AND folders.name = leaf || '/' WHERE docs.id = ?1");
  own.ForEach([&](int64_t id) {
    if (row.Bind(1, id).Step()) folders.push_back(row.Int(0));
    row.Reset();
    return true;
  });
  return folders;
}

/// The same by one pass over all folders, of which there may be some for each document. Folders are told apart by what
/// they lie in, and by hashes of their names.
std::vector<int64_t> FoldersByPlaces(const Places& places, const DocSet& own) {
  constexpr size_t kFilterBits = size_t{1} << 16;
  const auto key_of = [](uint32_t above, uint32_t name) { return uint64_t{above} << 32 | name; };
  const auto bit_of = [](uint64_t key) { return static_cast<size_t>(key ^ key >> 32) % kFilterBits; };
  std::vector<uint64_t> keys;
  std::vector<bool> filter(kFilterBits, false);
  own.ForEach([&](int64_t id) {
    const auto number = static_cast<size_t>(id);
    keys.push_back(key_of(places.Documents().At(number).folder, FolderNameHash(places.Documents().NameAt(number))));
    filter[bit_of(keys.back())] = true;
    return true;
  });
  std::sort(keys.begin(), keys.end());
  std::vector<int64_t> folders;
  for (size_t folder = 0; folder < places.Folders().End(); ++folder) {
    const uint64_t key = key_of(places.Folders().At(folder).folder, places.Folders().NameAt(folder));
    if (filter[bit_of(key)] && std::binary_search(keys.begin(), keys.end(), key)) {
      folders.push_back(static_cast<int64_t>(folder));
    }
  }
  return folders;
}

/// Of one search, from the folders' own documents to what is below the folders.
class BelowFolders {
 public:
  BelowFolders(StoreReader& reader, const Visible& visible)
      : reader_(reader), version_(visible.Version()), way_to_root_(WayToRoot(reader, visible)) {
    if (reader_.places.IsLoaded()) places_ = reader_.places.Load(reader_.database, version_);
  }

  /// All documents below, not trimmed.
  DocSet Of(const DocSet& own) {
    const size_t most = places_ == nullptr ? kFoldersByRowMax : places_->Documents().End() / kPlacesForARow + 1;
    if (own.Count() <= static_cast<int64_t>(most)) {
      const std::vector<int64_t> tops = Counting(FoldersByRows(reader_.database, own));
      if (const auto folders = FewBelow(tops, most); folders.has_value()) {
        DocSet found;
        AddDocumentsIn(reader_.database, *folders, found);
        return found;
      }
    }
    if (places_ == nullptr) places_ = reader_.places.Load(reader_.database, version_);
    return ByPlaces(Counting(FoldersByPlaces(*places_, own)));
  }

 private:
  /// Without those that hold all that is indexed.
  std::vector<int64_t> Counting(std::vector<int64_t> folders) {
    std::erase_if(folders, [this](int64_t folder) {
      return std::find(way_to_root_.begin(), way_to_root_.end(), folder) != way_to_root_.end();
    });
    return folders;
  }

  /// The folders and those below them; nothing when there are more than `most`.
  std::optional<std::vector<int64_t>> FewBelow(const std::vector<int64_t>& tops, size_t most) {
    std::vector<int64_t> all;
    for (const int64_t top : tops) {
      const auto below = reader_.tree.AtAndBelow(top, most);
      if (!below.has_value() || all.size() + below->size() > most) return std::nullopt;
      all.insert(all.end(), below->begin(), below->end());
    }
    return all;
  }

  DocSet ByPlaces(const std::vector<int64_t>& tops) {
    DocSet found;
    if (tops.empty()) return found;
    FoldersBelow below(*places_, tops);
    const PlaceList& documents = places_->Documents();
    for (size_t part = 0; part < documents.Parts(); ++part) {
      WorkLimit::Check();
      const PlaceList::Part* const places = documents.PartAt(part);
      for (size_t i = 0; places != nullptr && i < PlaceList::kPart; ++i) {
        if (below.Contains(places->places[i].folder)) found.Add(static_cast<int64_t>(part * PlaceList::kPart + i));
      }
    }
    return found;
  }

  StoreReader& reader_;
  const int64_t version_;
  const std::vector<int64_t> way_to_root_;
  std::shared_ptr<const Places> places_;  ///< null while they are not needed
};

}  // namespace

DocSet DocumentsInFoldersNamed(StoreReader& reader, const Visible& visible, const QueryWords& words) {
  if (reader.tree.IsFlat() || words.words.empty()) return {};
  const DocSet own = OwnDocuments(reader, words);
  if (own.Count() == 0) return {};
  DocSet found = BelowFolders(reader, visible).Of(own);
  visible.Trim(found);
  const int64_t count = found.Count();
  return count > kAlwaysFound && count > visible.Documents() / 4 ? DocSet() : found;
}

}  // namespace ferrox::engine
