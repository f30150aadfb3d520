#pragma once

#include <cstdint>
#include <string>

namespace ferrox::notifyd {

/// Which folder a path leads to.
struct FolderIdentity {
  uint64_t device = 0;
  uint64_t inode = 0;
  int64_t born_ns = 0;      ///< when it was made, 0 where the file system does not tell: inode numbers are given anew
  uint64_t mount = 0;       ///< as the mount table has it, 0 where the kernel does not tell
  uint64_t mount_once = 0;  ///< the same, never given to another mount; 0 where the kernel does not tell

  bool operator==(const FolderIdentity&) const = default;
  bool IsOnMountOf(const FolderIdentity& other) const {
    return device == other.device && mount == other.mount && mount_once == other.mount_once;
  }
};

/// What a look at a path found.
struct FolderLook {
  enum class Result {
    kUsable,
    kUnreadable,  ///< it is a folder, but cannot be opened, or it is not known what it is
    kGone,        ///< there is no folder, or the way to it leads through a link
  };

  Result result = Result::kGone;
  std::string problem = {};  ///< what is wrong with it, such as "is missing"; "" when it is usable
  FolderIdentity identity = {};
};

FolderLook LookAtFolder(const std::string& path);

}  // namespace ferrox::notifyd
