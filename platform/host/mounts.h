#pragma once

#include <string>
#include <vector>

/// Mount points, by statx and the kernel's mount table (/proc/self/mountinfo), which is read anew by each call. The
/// table is that of this process's mount namespace.
namespace kova::host {

/// The file-system type that the mount table gives for the mount of `path`, for example "fuse.sshfs"; empty when the
/// table does not tell.
std::string MountedType(const std::string& path);

/// 1 when a mount begins at `path`, 0 when not, below 0 with errno. Links are not followed.
int IsMountRoot(const std::string& path);

/// The deepest mount point at or above a path without links, whether or not the path is there.
std::string MountPointOf(std::string path);

/// Where something is mounted below (not at) a folder, in ascending order. Only the mount table is read: a file
/// system that hangs stops nobody.
std::vector<std::string> MountsBelow(const std::string& folder);

}  // namespace kova::host
