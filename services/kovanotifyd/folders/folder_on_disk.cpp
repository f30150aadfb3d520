#include "services/kovanotifyd/folders/folder_on_disk.h"

#include <dirent.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>

#include "base/files.h"

namespace ferrox::notifyd {

namespace {

/// Some file systems do not tell the type of an entry in the listing.
bool IsFolder(const dirent& entry, int parent) {
  if (entry.d_type != DT_UNKNOWN) return entry.d_type == DT_DIR;
  struct stat status = {};
  return fstatat(parent, entry.d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(status.st_mode);
}

bool IsDots(std::string_view name) { return name == "." || name == ".."; }

}  // namespace

/// Where the system call is missing or forbidden, a link above the last name goes unnoticed.
base::UniqueFd OpenFolder(const std::string& path) {
  constexpr int kFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;
  open_how how = {};
  how.flags = kFlags;
  how.resolve = RESOLVE_NO_SYMLINKS;
  const auto fd = static_cast<int>(syscall(SYS_openat2, AT_FDCWD, path.c_str(), &how, sizeof(how)));
  return base::UniqueFd(fd >= 0 || (errno != ENOSYS && errno != EPERM) ? fd : open(path.c_str(), kFlags));
}

uint64_t MountOf(int folder) {
  struct statx status = {};
  if (statx(folder, "", AT_EMPTY_PATH, STATX_MNT_ID, &status) < 0) return 0;
  if ((status.stx_mask & STATX_MNT_ID) != 0 && status.stx_mnt_id != 0) return status.stx_mnt_id;
  return uint64_t{status.stx_dev_major} << 32 | status.stx_dev_minor;
}

bool IsAt(const std::string& path, int folder) {
  struct stat there = {};
  struct stat ours = {};
  return lstat(path.c_str(), &there) == 0 && fstat(folder, &ours) == 0 && there.st_ino == ours.st_ino &&
         there.st_dev == ours.st_dev;
}

bool ListFolders(base::UniqueFd folder, const std::function<void(std::string_view name)>& visit) {
  const base::OpenFolderPtr dir(fdopendir(folder.Get()));
  if (dir == nullptr) return false;
  const int fd = folder.Release();
  errno = 0;
  for (const dirent* entry = readdir(dir.get()); entry != nullptr; errno = 0, entry = readdir(dir.get())) {
    if (!IsDots(entry->d_name) && IsFolder(*entry, fd)) visit(entry->d_name);
  }
  return errno == 0;
}

}  // namespace ferrox::notifyd
