#include "services/kovaelasticd/store/places.h"

#include "services/kovaelasticd/store/packed_numbers.h"

namespace ferrox::engine {

void PlaceList::Put(size_t part, const Part& places) {
  if (part >= parts_.size()) parts_.resize(part + 1);
  parts_[part] = std::make_shared<const Part>(places);
}

std::string PackPlaces(const PlaceList::Part& part) {
  size_t end = part.size();
  while (end > 0 && part[end - 1].folder == 0 && part[end - 1].access == 0) --end;
  std::string packed;
  Place before;
  for (size_t i = 0; i < end; ++i) {
    PutSigned(packed, int64_t{part[i].folder} - before.folder);
    PutSigned(packed, int64_t{part[i].access} - before.access);
    before = part[i];
  }
  return packed;
}

bool UnpackPlaces(std::string_view packed, PlaceList::Part& part) {
  int64_t folder = 0, access = 0;
  size_t i = 0;
  for (; !packed.empty() && i < part.size(); ++i) {
    int64_t folder_step = 0, access_step = 0;
    if (!CutSigned(packed, folder_step) || !CutSigned(packed, access_step)) return false;
    folder += folder_step;
    access += access_step;
    part[i] = {static_cast<uint32_t>(folder), static_cast<uint32_t>(access)};
  }
  for (; i < part.size(); ++i) part[i] = {};
  return packed.empty();
}

std::shared_ptr<const Places> Places::Load(Database& database, int64_t version, const Places* before) {
  const auto places = before == nullptr ? std::make_shared<Places>() : std::make_shared<Places>(*before);
  Statement changed = database.Prepare("SELECT part, packed FROM places WHERE version > ?1");
  changed.Bind(1, places->version_);
  PlaceList::Part part;
  while (changed.Step()) {
    if (!UnpackPlaces(changed.Text(1), part)) database.Fail(SQLITE_CORRUPT);
    const auto number = static_cast<size_t>(changed.Int(0));
    (number % 2 == 0 ? places->documents_ : places->folders_).Put(number / 2, part);
  }
  places->version_ = version;
  return places;
}

FoldersBelow::FoldersBelow(const Places& places, int64_t top)
    : folders_(places.Folders()), known_(folders_.End(), Known::kNo) {
  if (known_.empty()) return;
  if (static_cast<uint64_t>(top) < known_.size()) known_[static_cast<size_t>(top)] = Known::kInside;
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
