#include "services/kovaelasticd/store/readable_documents.h"

#include <array>
#include <string>
#include <string_view>
#include <utility>

#include "services/kovaelasticd/store/access_check.h"
#include "services/kovaelasticd/store/access_records.h"
#include "services/kovaelasticd/store/length_class.h"

namespace ferrox::engine {

namespace {

constexpr size_t kWordsInPart = PlaceList::kPart / 64;

std::array<int64_t, kLengthClasses> LengthsOfClasses() {
  std::array<int64_t, kLengthClasses> lengths{};
  for (size_t i = 0; i < lengths.size(); ++i) lengths[i] = LengthOfClass(static_cast<uint8_t>(i));
  return lengths;
}

/// Whether the list has parts that were changed behind `version`.
bool HasNewer(const PlaceList& list, int64_t version) {
  for (size_t part = 0; part < list.Parts(); ++part) {
    if (list.VersionOf(part) > version) return true;
  }
  return false;
}

int64_t FindRootDocument(Database& database, FolderTree& tree, std::string_view root) {
  const int64_t above = root.empty() ? FolderTree::kNone : tree.Find(FolderTree::FolderOf(root));
  Statement row = database.Prepare("SELECT id FROM docs WHERE folder = ?1 AND leaf = ?2");
  return row.Bind(1, above).Bind(2, FolderTree::LeafOf(root)).Step() ? row.Int(0) : -1;
}

}  // namespace

std::shared_ptr<const ReadableDocuments> ReadableDocuments::Make(Database& database, FolderTree& tree,
                                                                 const Places& places, const Asker& asker,
                                                                 const ReadableDocuments* before) {
  const auto made =
      before == nullptr ? std::make_shared<ReadableDocuments>() : std::make_shared<ReadableDocuments>(*before);
  ReadableDocuments& readable = *made;
  const int64_t version = std::exchange(readable.version_, places.Version());
  std::string root = asker.share_root;
  while (root.ends_with('/')) root.pop_back();
  const bool usable = asker.share_root.starts_with('/');
  readable.by_names_ = !asker.unseen_names.empty();
  readable.ReadRecords(database, asker);
  readable.RemoveRootDocument();
  readable.root_document_ = usable ? FindRootDocument(database, tree, root) : -1;
  bool all = before == nullptr;
  if (all || HasNewer(places.Folders(), version)) {
    all = readable.OpenFolders(places.Folders(), usable ? tree.Find(root + "/") : FolderTree::kNone) || all;
  }
  readable.parts_.resize(places.Documents().Parts());
  for (size_t part = 0; part < places.Documents().Parts(); ++part) {
    if (all || places.Documents().VersionOf(part) > version) readable.ReadPart(places.Documents(), part);
  }
  readable.AddRootDocument(places.Documents());
  return made;
}

/// Those that are new; numbers never change what they stand for.
void ReadableDocuments::ReadRecords(Database& database, const Asker& asker) {
  if (permissions_.empty()) permissions_.push_back(0);
  ReadAccessRecords(database, static_cast<int64_t>(permissions_.size()), Place::kAccessMax,
                    [&](int64_t number, const base::AccessRecord& record) {
                      permissions_.resize(static_cast<size_t>(number) + 1, 0);
                      permissions_.back() = PermissionsOf(record, asker);
                    });
}

/// Goes up from each folder to one of which it is known, so that each is asked once in whatever order they were made.
bool ReadableDocuments::OpenFolders(const PlaceList& folders, int64_t root) {
  std::vector<uint64_t> before = std::exchange(open_, std::vector<uint64_t>(folders.End() / 64, 0));
  std::vector<uint64_t> known(open_.size(), 0);
  const auto has = [](const std::vector<uint64_t>& bits, uint32_t number) {
    return (bits[number / 64] >> (number % 64) & 1) != 0;
  };
  const auto set = [](std::vector<uint64_t>& bits, uint32_t number) {
    bits[number / 64] |= uint64_t{1} << (number % 64);
  };
  const auto end = static_cast<uint32_t>(folders.End());
  if (root > 0 && root < end) {
    const auto number = static_cast<uint32_t>(root);
    set(known, number);
    if (Gives(folders.At(number), kMayEnter)) set(open_, number);
  }
  if (end > 0) set(known, 0);
  std::vector<uint32_t> way;
  for (uint32_t start = 0; start < end; ++start) {
    uint32_t folder = start;
    for (; folder < end && !has(known, folder); folder = folders.At(folder).folder) {
      set(known, folder);  // closed until the way back: ends the way where a damaged file has a circle
      way.push_back(folder);
    }
    bool is_open = folder < end && has(open_, folder);
    for (; !way.empty(); way.pop_back()) {
      const Place& place = folders.At(way.back());
      is_open = is_open && Gives(place, kMayEnter) && !IsUnseen(place);
      if (is_open) set(open_, way.back());
    }
  }
  return open_ != before;
}

void ReadableDocuments::ReadPart(const PlaceList& documents, size_t number) {
  static const std::array<int64_t, kLengthClasses> lengths = LengthsOfClasses();
  const PlaceList::Part* const part = documents.PartAt(number);
  Sums sums;
  for (size_t word = 0; word < kWordsInPart; ++word) {
    uint64_t bits = 0;
    for (size_t i = 0; part != nullptr && i < 64; ++i) {
      const Place& place = part->places[word * 64 + i];
      if (!IsOpen(place.folder) || !Gives(place, kMayRead) || IsUnseen(place)) continue;
      bits |= uint64_t{1} << i;
      ++sums.documents;
      sums.with_content += place.length != 0 ? 1 : 0;
      sums.text_bytes += lengths[place.length];
    }
    documents_.PutWord(number * kWordsInPart + word, bits);
  }
  Sums& before = parts_[number];
  sums_.documents += sums.documents - before.documents;
  sums_.with_content += sums.with_content - before.with_content;
  sums_.text_bytes += sums.text_bytes - before.text_bytes;
  before = sums;
}

void ReadableDocuments::AddRootDocument(const PlaceList& documents) {
  if (root_document_ < 0 || documents_.Contains(root_document_)) return;
  if (!Gives(documents.At(static_cast<size_t>(root_document_)), kMayRead)) return;
  documents_.Add(root_document_);
  ++sums_.documents;
  root_counts_ = true;
}

void ReadableDocuments::RemoveRootDocument() {
  if (!std::exchange(root_counts_, false)) return;
  documents_.Remove(root_document_);
  --sums_.documents;
}

size_t ReadableDocuments::SizeBytes() const {
  return sizeof(*this) + permissions_.capacity() + open_.capacity() * sizeof(uint64_t) + documents_.SizeBytes() +
         parts_.capacity() * sizeof(Sums);
}

}  // namespace ferrox::engine
