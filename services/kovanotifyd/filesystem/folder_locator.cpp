#include "services/kovanotifyd/filesystem/folder_locator.h"

#include "base/scope_exit.h"

namespace ferrox::notifyd {

namespace {

// Of the recursion: more folders than a path of PATH_MAX bytes can have. Only records that contradict each other would
// lead deeper.
constexpr int kDepthMax = 2100;

}  // namespace

FolderCache::Folder* FolderLocator::Locate(const HandleKey& key) {
  FolderCache::Folder* known = cache_.Find(key);
  return known != nullptr ? known : LocateAnew(key);
}

FolderCache::Folder* FolderLocator::LocateAnew(const HandleKey& key) {
  if (depth_ >= kDepthMax) return nullptr;
  ++depth_;
  const base::ScopeExit leave([this] { --depth_; });
  FolderPlace place;
  switch (PlaceOf(key, place)) {
    case FolderSource::Answer::kPlace:
      return Place(key, place);
    case FolderSource::Answer::kFailed:
      return nullptr;
    default:
      return cache_.Put(key, nullptr, "");
  }
}

/// Asks the disk only if no record ahead has the answer, and the records again afterwards: one that came meanwhile may
/// have moved the folder before the disk was read.
FolderSource::Answer FolderLocator::PlaceOf(const HandleKey& key, FolderPlace& place) {
  FolderSource::Answer answer = FolderSource::Answer::kPlace;
  const FanRecord* moved = window_.NextRelocation(key);
  if (moved == nullptr) {
    answer = source_.ReadPlace(key, place);
    source_.Drain(window_);
    moved = window_.NextRelocation(key);
  }
  if (moved == nullptr) return answer;
  place = {moved->folder, std::string(moved->name)};
  return FolderSource::Answer::kPlace;
}

FolderCache::Folder* FolderLocator::Place(const HandleKey& key, const FolderPlace& place) {
  for (int attempt = 0; attempt < 2; ++attempt) {
    FolderCache::Folder* parent = Locate(place.parent);
    if (parent == nullptr) return nullptr;
    FolderCache::Folder* folder = cache_.Put(key, parent, place.name);
    if (folder != nullptr) return folder;
    // The folder would be inside of itself: records that the kernel had joined have made the cache wrong.
    cache_.Clear();
  }
  return nullptr;
}

}  // namespace ferrox::notifyd
