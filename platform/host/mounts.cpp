#include "platform/host/mounts.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <set>
#include <sstream>

#include <kova/mountinfo.h>

#include "base/path.h"

namespace kova::host {

namespace {

/// What names the mount in the mount table: its id where the kernel tells it, else the device.
struct MountKey {
  bool by_id = false;
  unsigned long long id = 0;
  std::string device;
};

bool GetKey(const std::string& path, MountKey& key) {
  struct statx info = {};
#ifdef STATX_MNT_ID
  constexpr unsigned kWanted = STATX_BASIC_STATS | STATX_MNT_ID;
  if (statx(AT_FDCWD, path.c_str(), 0, kWanted, &info) != 0) return false;
  key.by_id = (info.stx_mask & STATX_MNT_ID) != 0;
  key.id = info.stx_mnt_id;
#else
  if (statx(AT_FDCWD, path.c_str(), 0, STATX_BASIC_STATS, &info) != 0) return false;
#endif
  key.device = std::to_string(info.stx_dev_major) + ":" + std::to_string(info.stx_dev_minor);
  return true;
}

/// The end of one line: "36 35 98:0 /root /mount/point options [more]... - ext4 source options".
bool IsInLine(const std::string& line, const MountKey& key, Mounted& mounted) {
  unsigned long long id = 0;
  char device[32] = "";
  if (sscanf(line.c_str(), "%llu %*u %31s", &id, device) != 2) return false;
  if (key.by_id ? id != key.id : device != key.device) return false;
  const size_t separator = line.find(" - ");
  if (separator == std::string::npos) return false;
  const size_t begin = separator + 3;
  mounted.type = line.substr(begin, line.find(' ', begin) - begin);
  mounted.options = line.substr(line.rfind(' ') + 1);  // the source before it may be empty
  return true;
}

}  // namespace

Mounted MountedAt(const std::string& path) {
  MountKey key;
  if (!GetKey(path, key)) return {};
  std::ifstream table("/proc/self/mountinfo");
  Mounted mounted;
  for (std::string line; std::getline(table, line);) {
    if (IsInLine(line, key, mounted)) return mounted;
  }
  return {};
}

int IsMountRoot(const std::string& path) {
  struct statx info = {};
  if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT, STATX_BASIC_STATS, &info) != 0) return -1;
  if ((info.stx_attributes_mask & STATX_ATTR_MOUNT_ROOT) != 0) {
    return (info.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0 ? 1 : 0;
  }
  // An older kernel: another device than the folder above. It misses bind mounts within a file system.
  struct stat self = {}, above = {};
  if (lstat(path.c_str(), &self) != 0 || lstat(base::FolderOf(path).c_str(), &above) != 0) return -1;
  return self.st_dev != above.st_dev || self.st_ino == above.st_ino ? 1 : 0;
}

std::string MountPointOf(std::string path) {
  while (path.size() > 1 && IsMountRoot(path) != 1) path = base::FolderOf(path);
  return path;
}

std::vector<std::string> MountsBelow(const std::string& folder) {
  std::set<std::string> points;
  std::ifstream table("/proc/self/mountinfo");
  for (std::string line; std::getline(table, line);) {
    std::istringstream fields(line);
    std::string id, parent, device, root, point;
    if (!(fields >> id >> parent >> device >> root >> point)) continue;
    point = PlainMountField(point);
    if (base::IsBelow(point, folder)) points.insert(point);
  }
  return {points.begin(), points.end()};
}

}  // namespace kova::host
