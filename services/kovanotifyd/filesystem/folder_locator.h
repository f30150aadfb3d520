#pragma once

#include <string>

#include "services/kovanotifyd/filesystem/folder_cache.h"
#include "services/kovanotifyd/filesystem/record_window.h"

namespace ferrox::notifyd {

/// In which folder another one is, and under which name.
struct FolderPlace {
  HandleKey parent = {};
  std::string name = {};
};

/// The file system as it is at present, and the kernel's queue of what was done to it.
class FolderSource {
 public:
  enum class Answer : uint8_t {
    kPlace,    ///< it is there
    kTop,      ///< it is the top of what is mounted
    kNowhere,  ///< removed, or outside of what is mounted
    kFailed,   ///< cannot be found out now
  };

  virtual ~FolderSource() = default;

  /// Reads where the folder is at present. When it is moved or removed meanwhile, the answer may be made of both
  /// states; but what had been done to it before the answer has been queued when this returns.
  virtual Answer ReadPlace(const HandleKey& folder, FolderPlace& place) = 0;
  /// Moves all that is queued into the window.
  virtual void Drain(RecordWindow& window) = 0;
};

/// Tells where folders are at the moment of the record that is worked on, although the disk is ahead of it by as many
/// moves as the reader is behind. What is known in the cache holds at that moment, since it is changed in the order of
/// the records. Any other folder is, until the first record ahead that moves or removes it, at that record's old place;
/// and without such a record, where the disk says: whatever had moved it before the disk was read would be ahead.
class FolderLocator {
 public:
  FolderLocator(FolderCache& cache, RecordWindow& window, FolderSource& source)
      : cache_(cache), window_(window), source_(source) {}

  /// The folder with all above it; null when that cannot be found out. As long-lived as FolderCache::Find's.
  FolderCache::Folder* Locate(const HandleKey& key);
  /// The same, whatever the cache has for the folder itself.
  FolderCache::Folder* LocateAnew(const HandleKey& key);
  /// Notes where the folder is from here on. Null when where that is cannot be found out.
  FolderCache::Folder* Place(const HandleKey& key, const FolderPlace& place);

 private:
  FolderSource::Answer PlaceOf(const HandleKey& key, FolderPlace& place);

  FolderCache& cache_;
  RecordWindow& window_;
  FolderSource& source_;
  int depth_ = 0;
};

}  // namespace ferrox::notifyd
