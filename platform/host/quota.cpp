#include <fcntl.h>
#include <sys/quota.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include <kova/instance.h>
#include <kova/share.h>

#include "base/path.h"
#include "base/unique_fd.h"
#include "platform/shared/failure.h"

namespace {

/// The first folder on the way up from `path` that exists.
std::string Existing(std::string path) {
  struct stat info = {};
  while (path != "/" && stat(path.c_str(), &info) != 0) path = base::FolderOf(path);
  return path;
}

bool FitsOnVolume(const std::string& path, int64_t bytes) {
  struct statvfs volume = {};
  if (statvfs(path.c_str(), &volume) != 0) {
    (void)KOVA_FAIL(KOVA_ERR_SYSTEM);
    return false;
  }
  if (volume.f_blocks == 0) return true;  // a file system that does not count its space
  const auto free_bytes = static_cast<uint64_t>(volume.f_bavail) * volume.f_frsize;
  if (free_bytes >= static_cast<uint64_t>(bytes)) return true;
  (void)KOVA_FAIL(KOVA_ERR_OUT_OF_SPACE);
  return false;
}

/// Asks the quota of the file system that holds `path`; true also where there is none, or it may not be asked.
bool FitsInQuota(uint32_t uid, const std::string& path, int64_t bytes) {
#ifdef SYS_quotactl_fd
  const base::UniqueFd folder(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  struct dqblk quota = {};
  if (!folder.Valid() || syscall(SYS_quotactl_fd, folder.Get(), QCMD(Q_GETQUOTA, USRQUOTA), uid, &quota) != 0) {
    return true;
  }
  constexpr uint64_t kLimitUnitBytes = 1024;
  const bool limited = (quota.dqb_valid & QIF_BLIMITS) != 0 && quota.dqb_bhardlimit != 0;
  if (!limited || quota.dqb_curspace + static_cast<uint64_t>(bytes) <= quota.dqb_bhardlimit * kLimitUnitBytes) {
    return true;
  }
  (void)KOVA_FAIL(KOVA_ERR_OVER_QUOTA);
  return false;
#else
  (void)uid, (void)path, (void)bytes;
  return true;
#endif
}

bool OnSameVolume(const std::string& a, const std::string& b) {
  struct stat info_a = {}, info_b = {};
  return stat(a.c_str(), &info_a) == 0 && stat(b.c_str(), &info_b) == 0 && info_a.st_dev == info_b.st_dev;
}

}  // namespace

int KOVAQuotaIsEnough(uint32_t uid, const char* path, int64_t bytes) {
  if (path == nullptr || bytes < 0) {
    (void)KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
    return 0;
  }
  // Asked for nobody in particular, a process that is not root is bound by the quota of its own user.
  const uint32_t owner = uid != 0 ? uid : geteuid();
  const std::string index_data = Existing(kova::InstanceRoot() + "/var/lib/kova/fileindex/db");
  if (!FitsOnVolume(path, bytes) || (owner != 0 && !FitsInQuota(owner, path, bytes))) return 0;
  if (OnSameVolume(path, index_data)) return 1;
  return FitsOnVolume(index_data, bytes) && (owner == 0 || FitsInQuota(owner, index_data, bytes)) ? 1 : 0;
}
