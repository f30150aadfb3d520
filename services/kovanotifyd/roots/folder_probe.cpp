#include "services/kovanotifyd/roots/folder_probe.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>

#include "base/unique_fd.h"
#include "common/file_util.h"
#include "common/log.h"

// Newer than the headers of some hosts.
#ifndef STATX_MNT_ID
#define STATX_MNT_ID 0x1000U
#endif
#ifndef STATX_MNT_ID_UNIQUE
#define STATX_MNT_ID_UNIQUE 0x4000U
#endif

namespace ferrox::notifyd {

namespace {

constexpr int kProbeFlags = AT_SYMLINK_NOFOLLOW | AT_NO_AUTOMOUNT;

/// The id of the given kind, one of the two above; 0 where the kernel does not tell.
uint64_t MountId(const std::string& path, unsigned kind) {
  struct statx info = {};
  if (statx(AT_FDCWD, path.c_str(), kProbeFlags, kind, &info) != 0 || (info.stx_mask & kind) == 0) return 0;
  return info.stx_mnt_id;
}

FolderProbe Failure(FolderProbe::Result result, const std::string& problem) { return {result, problem}; }

FolderProbe FailureByErrno() {
  if (errno == ENOENT) return Failure(FolderProbe::Result::kGone, "is missing");
  if (errno == ENOTDIR) return Failure(FolderProbe::Result::kGone, "is missing: something above it is no folder");
  return Failure(FolderProbe::Result::kUnreadable, "cannot be read: " + ErrnoText());
}

FolderProbe ProbeLocalFolder(const std::string& path) {
  struct statx info = {};
  if (statx(AT_FDCWD, path.c_str(), kProbeFlags, STATX_BASIC_STATS | STATX_BTIME, &info) != 0) return FailureByErrno();
  if (S_ISLNK(info.stx_mode)) return Failure(FolderProbe::Result::kGone, "is a symbolic link");
  if (!S_ISDIR(info.stx_mode)) return Failure(FolderProbe::Result::kGone, "is no folder");
  const base::UniqueFd opened(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!opened.Valid()) return FailureByErrno();
  if (RealPath(path) != path) return Failure(FolderProbe::Result::kGone, "is reached through a symbolic link");
  FolderProbe probe = {FolderProbe::Result::kUsable};
  probe.identity.device = (static_cast<uint64_t>(info.stx_dev_major) << 32) | info.stx_dev_minor;
  probe.identity.inode = info.stx_ino;
  if ((info.stx_mask & STATX_BTIME) != 0) {
    probe.identity.born_ns = info.stx_btime.tv_sec * 1'000'000'000 + info.stx_btime.tv_nsec;
  }
  probe.identity.mount = MountId(path, STATX_MNT_ID);
  probe.identity.mount_once = MountId(path, STATX_MNT_ID_UNIQUE);
  return probe;
}

}  // namespace

FolderProbe ProbeFolder(const std::string& path, const MountTable& mounts) {
  const uint64_t mount = mounts.MountOf(path);
  FolderProbe probe;
  if (mounts.IsNetwork(mount)) {
    probe.result = FolderProbe::Result::kUsable;
  } else {
    probe = ProbeLocalFolder(path);
  }
  if (probe.identity.mount == 0) probe.identity.mount = mount;
  return probe;
}

}  // namespace ferrox::notifyd
