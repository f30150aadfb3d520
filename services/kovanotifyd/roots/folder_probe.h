#pragma once

#include <cstdint>
#include <string>

#include "services/kovanotifyd/roots/mount_table.h"

namespace ferrox::notifyd {

/// Which folder a path leads to. Two folders are the same one if all of these are equal: inode numbers are reused, and
/// a volume that is mounted again may look the same in every other number.
struct FolderIdentity {
  uint64_t device = 0;
  uint64_t inode = 0;
  int64_t born_ns = 0;      ///< when it was made; 0 where the file system does not tell
  uint64_t mount = 0;       ///< the id in the mount table; 0 where the kernel does not tell
  uint64_t mount_once = 0;  ///< an id that no other mount ever gets; 0 where the kernel does not tell

  bool operator==(const FolderIdentity&) const = default;
  bool IsOnMountOf(const FolderIdentity& other) const {
    return device == other.device && mount == other.mount && mount_once == other.mount_once;
  }
};

/// What a path leads to at present.
struct FolderProbe {
  enum class Result {
    kUsable,
    kUnreadable,  ///< a folder that cannot be opened, or something that cannot be examined
    kGone,        ///< no folder, or one that is reached through a symbolic link
  };

  Result result = Result::kGone;
  std::string problem = {};  ///< how it is not usable, to follow its path: "is missing"; "" when it is usable
  FolderIdentity identity = {};
};

/// Examines the path. On a network file system nothing is asked, since a server that is away would block the caller:
/// what is there is taken to be usable, and only its mount is known.
FolderProbe ProbeFolder(const std::string& path, const MountTable& mounts);

}  // namespace ferrox::notifyd
