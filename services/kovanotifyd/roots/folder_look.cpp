#include "services/kovanotifyd/roots/folder_look.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>

#include "base/unique_fd.h"
#include "common/file_util.h"
#include "common/log.h"

#ifndef STATX_MNT_ID
#define STATX_MNT_ID 0x1000U
#endif
#ifndef STATX_MNT_ID_UNIQUE
#define STATX_MNT_ID_UNIQUE 0x4000U
#endif

namespace ferrox::notifyd {

namespace {

constexpr int kLookFlags = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT;

uint64_t MountId(const std::string& path, unsigned kind) {
  struct statx info = {};
  if (statx(AT_FDCWD, path.c_str(), kLookFlags, kind, &info) != 0 || (info.stx_mask & kind) == 0) return 0;
  return info.stx_mnt_id;
}

FolderLook Failure(FolderLook::Result result, const std::string& problem) { return {result, problem}; }

FolderLook FailureByErrno() {
  if (errno == ENOENT) return Failure(FolderLook::Result::kGone, "is missing");
  if (errno == ENOTDIR) return Failure(FolderLook::Result::kGone, "is missing: something above it is no folder");
  return Failure(FolderLook::Result::kUnreadable, "cannot be read: " + ErrnoText());
}

}  // namespace

FolderLook LookAtFolder(const std::string& path) {
  struct statx info = {};
  if (statx(AT_FDCWD, path.c_str(), kLookFlags, STATX_BASIC_STATS | STATX_BTIME, &info) != 0) return FailureByErrno();
  if (S_ISLNK(info.stx_mode)) return Failure(FolderLook::Result::kGone, "is a symbolic link");
  if (!S_ISDIR(info.stx_mode)) return Failure(FolderLook::Result::kGone, "is no folder");
  const base::UniqueFd opened(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!opened.Valid()) return FailureByErrno();
  if (RealPath(path) != path) return Failure(FolderLook::Result::kGone, "is reached through a symbolic link");
  FolderLook look = {FolderLook::Result::kUsable};
  look.identity.device = (static_cast<uint64_t>(info.stx_dev_major) << 32) | info.stx_dev_minor;
  look.identity.inode = info.stx_ino;
  if ((info.stx_mask & STATX_BTIME) != 0) {
    look.identity.born_ns = info.stx_btime.tv_sec * 1'000'000'000 + info.stx_btime.tv_nsec;
  }
  look.identity.mount = MountId(path, STATX_MNT_ID);
  look.identity.mount_once = MountId(path, STATX_MNT_ID_UNIQUE);
  return look;
}

}  // namespace ferrox::notifyd
