#pragma once

#include <string>

#include "services/kovanotifyd/filesystem/folder_cache.h"
#include "services/kovanotifyd/filesystem/record_window.h"

namespace ferrox::notifyd {

/// Where a folder is: the folder above it, and its name there.
struct FolderPlace {
  HandleKey parent = {};
  std::string name = {};
};

/// The file system as it is at present, and the kernel's queue of records of what was done to it.
class FolderSource {
 public:
  enum class Answer : uint8_t {
    kPlace,    ///< the folder is at the place
    kTop,      ///< it is the top of a mount
    kNowhere,  ///< it is removed, or outside of all mounts
    kFailed,   ///< that cannot be found out now
  };

  virtual ~FolderSource() = default;

  /// Reads where the folder is at present. If it is moved or removed meanwhile, the answer may be mixed from before and
  /// after; but the records of all that was done to it before the answer are queued when this returns.
  virtual Answer ReadPlace(const HandleKey& folder, FolderPlace& place) = 0;
  /// Moves all queued records into the window.
  virtual void Drain(RecordWindow& window) = 0;
};

/// Finds where folders were at the moment of the record that is worked on, although the disk is ahead of it by all the
/// records that are still to be worked on. What is in the cache is right for that moment, since it is changed in the
/// order of the records. For any other folder the records ahead are searched: until the first one that moves or removes
/// it, the folder is at the old place in that record. Without such a record it is where the disk says, because a move
/// that came before the disk was read would have a record ahead.
class FolderLocator {
 public:
  FolderLocator(FolderCache& cache, RecordWindow& window, FolderSource& source)
      : cache_(cache), window_(window), source_(source) {}

  /// The folder with all folders above it, in the cache; null when its place cannot be found out. Valid as long as what
  /// FolderCache::Find returns.
  FolderCache::Folder* Locate(const HandleKey& key);
  /// The same, even if the cache has the folder.
  FolderCache::Folder* LocateAnew(const HandleKey& key);
  /// Puts the folder at a place from this record on. Null when the folders above it cannot be located.
  FolderCache::Folder* Place(const HandleKey& key, const FolderPlace& place);

 private:
  FolderSource::Answer PlaceOf(const HandleKey& key, FolderPlace& place);

  FolderCache& cache_;
  RecordWindow& window_;
  FolderSource& source_;
  int depth_ = 0;  ///< of the recursion through the folders above
};

}  // namespace ferrox::notifyd
