#define FERROX_SOURCE "operation_runner"

#include "services/fileindexd/share_place.h"

#include <dirent.h>
#include <fcntl.h>

#include "base/files.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::indexd {

namespace {

/// False also when it cannot be read.
bool IsEmptyFolder(const std::string& path) {
  const base::OpenFolderPtr dir(opendir(path.c_str()));
  if (!dir) return false;
  while (const dirent* entry = readdir(dir.get())) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") return false;
  }
  return true;
}

}  // namespace

std::string MountPointOf(const std::string& folder, const IsMountPoint& is_mount_point) {
  for (std::string path = folder; path.size() > 1; path = Dirname(path)) {
    if (is_mount_point(path) == 1) return path;
  }
  return "";
}

std::string AbsenceOf(const std::string& root, const std::string& mount_point, const IsMountPoint& is_mount_point) {
  struct stat status = {};
  const bool missing = stat(root.c_str(), &status) != 0 || !S_ISDIR(status.st_mode);
  const bool unmounted = !mount_point.empty() && is_mount_point(mount_point) != 1;
  if (unmounted && (missing || IsEmptyFolder(root))) {
    return "the volume of its folder " + root + " is not mounted; mount it at " + mount_point + ", or remove the share";
  }
  return missing ? "its folder " + root + " is not there; mount it, or remove the share" : "";
}

HeldFolder::HeldFolder(const std::string& path)
    : path_(path), fd_(open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)) {}

bool HeldFolder::IsStillThere() const {
  struct stat held = {};
  struct stat there = {};
  return fd_.Valid() && fstat(fd_.Get(), &held) == 0 && stat(path_.c_str(), &there) == 0 &&
         held.st_dev == there.st_dev && held.st_ino == there.st_ino;
}

void HeldFolder::CheckStillThere() const {
  FERROX_FAIL_IF(!IsStillThere(), Error::kPathNotIndexable,
                 "the share's folder was unmounted or replaced while it was looked at; it is looked at again");
}

}  // namespace ferrox::indexd
