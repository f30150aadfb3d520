#include <fcntl.h>
#include <linux/btrfs.h>
#include <linux/magic.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include <kova/fs.h>

#include "base/unique_fd.h"
#include "platform/host/mounts.h"
#include "platform/shared/failure.h"

namespace {

constexpr ino_t kBtrfsSubvolumeInode = 256;

bool IsMarker(const std::string& component, const std::string& parent_name) {
  return component == "#snapshot" || component == ".snapshots" || (component == "snapshot" && parent_name == ".zfs");
}

/// Whether a read-only subvolume begins at `path`: the form that snapshots have on btrfs.
bool IsReadOnlySubvolume(const std::string& path) {
  const base::UniqueFd folder(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat info = {};
  struct statfs file_system = {};
  if (!folder.Valid() || fstat(folder.Get(), &info) != 0 || info.st_ino != kBtrfsSubvolumeInode) return false;
  if (fstatfs(folder.Get(), &file_system) != 0) return false;
  if (static_cast<uint32_t>(file_system.f_type) != BTRFS_SUPER_MAGIC) return false;
  __u64 flags = 0;
  return ioctl(folder.Get(), BTRFS_IOC_SUBVOL_GETFLAGS, &flags) == 0 && (flags & BTRFS_SUBVOL_RDONLY) != 0;
}

/// Whether a read-only mount begins at `path`: the form that they have elsewhere.
bool IsReadOnlyMount(const std::string& path) {
  struct statvfs volume = {};
  return kova::host::IsMountRoot(path) == 1 && statvfs(path.c_str(), &volume) == 0 && (volume.f_flag & ST_RDONLY) != 0;
}

}  // namespace

/// A path lies in a snapshot when it has a folder of a snapshots' name, and that folder or one on the way down from it
/// to the path is a read-only subvolume or a read-only mount. A folder that is only named so is none.
int KLIBFhsPathInSnapshot(const char* path, int* in_snapshot) {
  if (path == nullptr || in_snapshot == nullptr || path[0] != '/') return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  *in_snapshot = 0;
  const std::string full_path = path;
  bool below_marker = false;
  std::string parent_name;
  for (size_t begin = 1; begin <= full_path.size();) {
    const size_t end = std::min(full_path.find('/', begin), full_path.size());
    const std::string component = full_path.substr(begin, end - begin);
    below_marker = below_marker || IsMarker(component, parent_name);
    const std::string folder = full_path.substr(0, end);
    if (below_marker && (IsReadOnlySubvolume(folder) || IsReadOnlyMount(folder))) {
      *in_snapshot = 1;
      return 0;
    }
    parent_name = component;
    begin = end + 1;
  }
  return 0;
}
