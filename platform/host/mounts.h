#pragma once

#include <string>
#include <vector>

/// Mount points, by statx and the kernel's mount table (/proc/self/mountinfo), which is read anew by each call. The
/// table is that of this process's mount namespace.
namespace kova::host {

/// What the mount table tells of the mount of a path; empty texts when it does not tell.
struct Mounted {
  std::string type;     ///< for example "fuse.sshfs"
  std::string options;  ///< of the file system itself, for example "rw,user_id=0,default_permissions"
};
Mounted MountedAt(const std::string& path);

/// 1 when a mount begins at `path`, 0 when not, below 0 with errno. Links are not followed.
int IsMountRoot(const std::string& path);

/// The deepest mount point at or above a path without links, whether or not the path is there.
std::string MountPointOf(std::string path);

/// Where something is mounted below (not at) a folder, in ascending order. Only the mount table is read: a file
/// system that hangs stops nobody.
std::vector<std::string> MountsBelow(const std::string& folder);

}  // namespace kova::host
