#include "services/kovaelasticd/store/places.h"

#include <algorithm>
#include <cstddef>

#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/packed_numbers.h"

namespace ferrox::engine {

namespace {

/// Joins the key of what is above with a name. Every bit of both counts for every bit of the result.
uint64_t JoinKeys(uint64_t above, uint64_t name) {
  uint64_t key = (above ^ name) * 0x9E3779B97F4A7C15U;
  key = (key ^ key >> 32) * 0xD6E8FEB86659FD93U;
  return key ^ key >> 32;
}

/// Adds the next difference to `number`; with a short way for the common ones of one byte.
inline bool CutStep(std::string_view& bytes, uint32_t& number) {
  if (!bytes.empty() && static_cast<unsigned char>(bytes.front()) < 0x80) {
    number += static_cast<uint32_t>(Unzigzag(static_cast<unsigned char>(bytes.front())));
    bytes.remove_prefix(1);
    return true;
  }
  int64_t step = 0;
  const bool whole = CutSigned(bytes, step);
  number += static_cast<uint32_t>(step);
  return whole;
}

/// In a packed number, above what an access record's may be. The next number is the difference to the one without it,
/// so that a mark costs once.
constexpr uint32_t kUnseen = uint32_t{1} << 24;

uint32_t MarkedAccess(const Place& place) { return place.access | (place.unseen != 0 ? kUnseen : 0); }

void PutMarkedAccess(Place& place, uint32_t marked) {
  const uint32_t access = marked & (kUnseen - 1);
  place.access = (access > Place::kAccessMax ? 0 : access) & Place::kAccessMax;
  place.unseen = (marked & kUnseen) != 0 ? 1 : 0;
}

constexpr size_t kNameBytes = sizeof(uint32_t);

inline uint32_t NameBytes(const char* bytes) {
  const auto byte = [bytes](size_t i) { return uint32_t{static_cast<unsigned char>(bytes[i])}; };
  return byte(0) | byte(1) << 8 | byte(2) << 16 | byte(3) << 24;
}

}  // namespace

uint32_t NameHash(std::string_view name) {
  uint32_t hash = 2166136261U;
  for (const char c : name) hash = (hash ^ static_cast<unsigned char>(c)) * 16777619U;
  return hash;
}

void PlaceList::Put(size_t part, int64_t version, std::shared_ptr<const Part> places) {
  if (part >= parts_.size()) parts_.resize(part + 1);
  parts_[part] = {std::move(places), version};
}

std::string PackPlaces(const PlaceList::Part& part) {
  size_t end = part.places.size();
  while (end > 0 && part.places[end - 1].folder == 0 && part.places[end - 1].access == 0) --end;
  std::string packed;
  Place before;
  for (size_t i = 0; i < end; ++i) {
    const Place& place = part.places[i];
    PutSigned(packed, int64_t{place.folder} - before.folder);
    PutSigned(packed, int64_t{MarkedAccess(place)} - int64_t{before.access});
    before = place;
    if (place.folder == 0) continue;
    packed += static_cast<char>(place.length);
    for (size_t byte = 0; byte < kNameBytes; ++byte) packed += static_cast<char>(part.names[i] >> (8 * byte));
  }
  return packed;
}

bool UnpackPlaces(std::string_view packed, PlaceList::Part& part) {
  uint32_t folder = 0, access = 0;
  size_t i = 0;
  for (; !packed.empty() && i < part.places.size(); ++i) {
    if (!CutStep(packed, folder) || !CutStep(packed, access)) return false;
    Place& place = part.places[i];
    place.folder = folder;
    PutMarkedAccess(place, access);
    access &= kUnseen - 1;
    place.length = 0;
    part.names[i] = 0;
    if (folder == 0) continue;
    if (packed.size() < 1 + kNameBytes) return false;
    place.length = static_cast<uint8_t>(packed[0]);
    part.names[i] = NameBytes(packed.data() + 1);
    packed.remove_prefix(1 + kNameBytes);
  }
  std::fill(part.places.begin() + static_cast<ptrdiff_t>(i), part.places.end(), Place());
  std::fill(part.names.begin() + static_cast<ptrdiff_t>(i), part.names.end(), 0);
  return packed.empty();
}

const std::vector<uint64_t>& FolderKeys::Of(const PlaceList& folders) {
  const base::MutexLock guard(mutex_);
  if (made_) return keys_;
  keys_.assign(folders.End(), 0);
  if (keys_.size() > FolderTree::kTop) keys_[FolderTree::kTop] = 1;
  std::vector<bool> known(keys_.size(), false);
  if (known.size() > FolderTree::kTop) known[0] = known[FolderTree::kTop] = true;
  std::vector<uint32_t> way;
  for (size_t start = 0; start < keys_.size(); ++start) {
    for (auto folder = static_cast<uint32_t>(start); folder < known.size() && !known[folder];
         folder = folders.At(folder).folder) {
      known[folder] = true;  // ends the way where a damaged file has a circle
      way.push_back(folder);
    }
    for (; !way.empty(); way.pop_back()) {
      const uint32_t folder = way.back(), above = folders.At(folder).folder;
      if (above < keys_.size() && keys_[above] != 0) keys_[folder] = JoinKeys(keys_[above], folders.NameAt(folder)) | 1;
    }
  }
  made_ = true;
  return keys_;
}

uint64_t PathKeys::Of(int64_t document) const {
  const auto number = static_cast<size_t>(document);
  const uint32_t folder = documents_.At(number).folder;
  return folder < folder_keys_.size() ? JoinKeys(folder_keys_[folder], documents_.NameAt(number)) : 0;
}

std::shared_ptr<const Places> Places::Load(Database& database, int64_t version, const Places* before) {
  const auto places = before == nullptr ? std::make_shared<Places>() : std::make_shared<Places>(*before);
  Statement changed = database.Prepare("SELECT part, version, packed FROM locations WHERE version > ?1");
  changed.Bind(1, places->version_);
  bool other_folders = before == nullptr;
  while (changed.Step()) {
    const auto part = std::make_shared_for_overwrite<PlaceList::Part>();
    if (!UnpackPlaces(changed.Text(2), *part)) database.Fail(SQLITE_CORRUPT);
    const auto number = static_cast<size_t>(changed.Int(0));
    const bool is_folders = number % 2 != 0;
    other_folders = other_folders || is_folders;
    (is_folders ? places->folders_ : places->documents_).Put(number / 2, changed.Int(1), part);
  }
  if (other_folders) places->folder_keys_ = std::make_shared<FolderKeys>();
  places->version_ = version;
  return places;
}

FoldersBelow::FoldersBelow(const Places& places, const std::vector<int64_t>& tops)
    : folders_(places.Folders()), known_(folders_.End(), Known::kNo) {
  if (known_.empty()) return;
  for (const int64_t top : tops) {
    if (static_cast<uint64_t>(top) < known_.size()) known_[static_cast<size_t>(top)] = Known::kInside;
  }
  known_[0] = Known::kOutside;
}

bool FoldersBelow::Contains(uint32_t folder) {
  way_.clear();
  while (folder < known_.size() && known_[folder] == Known::kNo) {
    known_[folder] = Known::kOutside;  // ends the way where a damaged file has a circle
    way_.push_back(folder);
    folder = folders_.At(folder).folder;
  }
  const Known known = folder < known_.size() ? known_[folder] : Known::kOutside;
  for (const uint32_t passed : way_) known_[passed] = known;
  return known == Known::kInside;
}

}  // namespace ferrox::engine
