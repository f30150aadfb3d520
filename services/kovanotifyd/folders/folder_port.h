#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovanotifyd/folders/folder_tree.h"

namespace ferrox::notifyd {

/// One record of the kernel: what happened to a name in a watched folder, or to the folder itself where the name is "".
struct FolderRecord {
  enum class Kind : uint8_t {
    kCreated,
    kModified,
    kWritten,
    kAttributes,
    kDeleted,
    kRenamed,    ///< the folder of a side that is not watched is 0
    kSelfMoved,  ///< the folder itself was moved or renamed
    kSelfGone,   ///< the folder was removed or unmounted, and its watch with it
    kUncertain,  ///< the name was made and removed, in an order that is not known
    kLost,       ///< the kernel dropped records at this point of the order
  };

  Kind kind = Kind::kLost;
  bool is_folder = false;
  FolderKey folder = 0;  ///< that has the name; 0 also for the attributes of a folder that is not watched
  std::string_view name = {};
  FolderKey old_folder = 0;  ///< of kRenamed
  std::string_view old_name = {};
  uint64_t file = 0;  ///< the inode number of the file that had the name, 0 where the port cannot tell
};

/// An interface of the kernel that watches single folders, each by a watch of its own. Belongs to one thread.
class FolderPort {
 public:
  /// What is to be reported of a folder.
  enum class Wanted {
    kAll,     ///< everything that happens in it and to it
    kPlace,   ///< only that the folder itself is moved or removed
    kCookie,  ///< changes of attributes of what is in it
  };
  /// How many watches one user may have.
  struct Limit {
    uint64_t watches = 0;      ///< 0: no limit
    std::string setting = {};  ///< the kernel's setting, such as "fs.inotify.max_user_watches"
  };

  virtual ~FolderPort() = default;

  /// As Watcher::Name.
  virtual const char* Name() const = 0;
  virtual Limit WatchLimit() const = 0;
  /// Becomes readable when Read has something to read.
  virtual int Fd() const = 0;

  /// Watches an open folder, also for what it was watched for before.
  /// @return errno, or 0 and the folder's key, which it has as long as it is watched and no other folder has.
  virtual int Watch(int folder, Wanted wanted, FolderKey& key) = 0;
  /// Why watching failed with that errno: a sentence without a full stop.
  virtual std::string Reason(int error) const = 0;
  /// Ends the watch. `path` is where the folder was last, for ports that find it by that; one that is elsewhere by now
  /// stays watched. Queued records still come.
  virtual void Unwatch(FolderKey key, const std::string& path) = 0;
  /// Whether Unwatch needs the path.
  virtual bool UnwatchesByPath() const = 0;

  /// Reads what the kernel has, at most a few thousand records. Their names are valid until the next call.
  /// @return whether there was anything to read.
  virtual bool Read(std::vector<FolderRecord>& records) = 0;
};

}  // namespace ferrox::notifyd
