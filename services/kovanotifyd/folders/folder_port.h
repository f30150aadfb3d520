#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovanotifyd/folders/folder_tree.h"

namespace ferrox::notifyd {

/// What happened to one name in a watched folder, or, where the name is "", to the folder itself.
struct FolderRecord {
  enum class Kind : uint8_t {
    kCreated,
    kModified,
    kWritten,
    kAttributes,
    kDeleted,
    kRenamed,    ///< a side where nothing is watched is missing: its folder is 0
    kSelfMoved,  ///< the folder itself has another place or name
    kSelfGone,   ///< the folder is not watched any more: removed or unmounted
    kUncertain,  ///< the name was made and removed, in an order that is not known
    kLost,       ///< the kernel dropped records here
  };

  Kind kind = Kind::kLost;
  bool is_folder = false;
  FolderKey folder = 0;  ///< 0 also for the attributes of a folder that is not watched
  std::string_view name = {};
  FolderKey old_folder = 0;  ///< of kRenamed
  std::string_view old_name = {};
  uint64_t file = 0;  ///< the number of the file that the name stood for, where the port can tell
};

/// The kernel's part of a watcher that needs a watch for each folder.
class FolderPort {
 public:
  /// What is wanted of a folder.
  enum class Wanted {
    kAll,     ///< whatever happens in it, and to it
    kPlace,   ///< only that the folder itself is moved or removed
    kCookie,  ///< changes of attributes of what is in it
  };
  /// How many watches one user may have.
  struct Limit {
    uint64_t watches = 0;      ///< 0: no limit
    std::string setting = {};  ///< which names it, such as "fs.inotify.max_user_watches"
  };

  virtual ~FolderPort() = default;

  /// As Watcher::Name.
  virtual const char* Name() const = 0;
  virtual Limit WatchLimit() const = 0;
  /// Becomes readable when Read has something to read.
  virtual int Fd() const = 0;

  /// Watches an open folder. What was wanted of it before is still wanted.
  /// @return errno, or 0 and the folder's key: the same each time as long as it is watched, and no other folder's.
  virtual int Watch(int folder, Wanted wanted, FolderKey& key) = 0;
  /// Why watching failed, a sentence without a full stop.
  virtual std::string Reason(int error) const = 0;
  /// Ends it, as far as possible: `path` is where the folder was, for ports that need it. Records may still come.
  virtual void Unwatch(FolderKey key, const std::string& path) = 0;
  /// Whether Unwatch needs the path.
  virtual bool UnwatchesByPath() const = 0;

  /// Reads what the kernel has, at most a few thousand records. Their names are valid until the next call.
  /// @return whether there was anything to read.
  virtual bool Read(std::vector<FolderRecord>& records) = 0;
};

}  // namespace ferrox::notifyd
