#include <fcntl.h>
#include <linux/magic.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <cstring>
#include <string>

#include <kova/fs.h>

#include "platform/host/mounts.h"
#include "platform/host/share_table.h"
#include "platform/shared/failure.h"

namespace {

struct MagicRow {
  uint32_t magic;
  int type;
};

/// statfs's numbers. Those without a name in the kernel's headers are written out with the file system's.
constexpr MagicRow kMagics[] = {
    {EXT4_SUPER_MAGIC, KOVA_FS_EXT},
    {BTRFS_SUPER_MAGIC, KOVA_FS_BTRFS},
    {0x58465342 /* xfs */, KOVA_FS_XFS},
    {TMPFS_MAGIC, KOVA_FS_TMPFS},
    {RAMFS_MAGIC, KOVA_FS_TMPFS},
    {OVERLAYFS_SUPER_MAGIC, KOVA_FS_OVERLAY},
    {MSDOS_SUPER_MAGIC, KOVA_FS_FAT},
    {0x2011bab0 /* exfat */, KOVA_FS_FAT},
    {0x5346544e /* ntfs */, KOVA_FS_NTFS},
    {0x7366746e /* ntfs3 */, KOVA_FS_NTFS},
    {0x2fc12fc1 /* zfs */, KOVA_FS_ZFS},
    {F2FS_SUPER_MAGIC, KOVA_FS_F2FS},
    {NFS_SUPER_MAGIC, KOVA_FS_NFS},
    {SMB_SUPER_MAGIC, KOVA_FS_CIFS},
    {CIFS_SUPER_MAGIC, KOVA_FS_CIFS},
    {SMB2_SUPER_MAGIC, KOVA_FS_CIFS},
    {CEPH_SUPER_MAGIC, KOVA_FS_CEPH},
    {AFS_SUPER_MAGIC, KOVA_FS_OTHER_REMOTE},
    {AFS_FS_MAGIC, KOVA_FS_OTHER_REMOTE},
    {CODA_SUPER_MAGIC, KOVA_FS_OTHER_REMOTE},
    {NCP_SUPER_MAGIC, KOVA_FS_OTHER_REMOTE},
    {0x0bd00bd0 /* lustre */, KOVA_FS_OTHER_REMOTE},
    {ISOFS_SUPER_MAGIC, KOVA_FS_ISO9660},
    {UDF_SUPER_MAGIC, KOVA_FS_UDF},
    {SQUASHFS_MAGIC, KOVA_FS_SQUASHFS},
    {CRAMFS_MAGIC, KOVA_FS_SQUASHFS},
    {EROFS_SUPER_MAGIC_V1, KOVA_FS_EROFS},
    {PROC_SUPER_MAGIC, KOVA_FS_PSEUDO},
    {SYSFS_MAGIC, KOVA_FS_PSEUDO},
    {DEVPTS_SUPER_MAGIC, KOVA_FS_PSEUDO},
    {CGROUP_SUPER_MAGIC, KOVA_FS_PSEUDO},
    {CGROUP2_SUPER_MAGIC, KOVA_FS_PSEUDO},
    {DEBUGFS_MAGIC, KOVA_FS_PSEUDO},
    {TRACEFS_MAGIC, KOVA_FS_PSEUDO},
    {SECURITYFS_MAGIC, KOVA_FS_PSEUDO},
    {SELINUX_MAGIC, KOVA_FS_PSEUDO},
    {SMACK_MAGIC, KOVA_FS_PSEUDO},
    {BPF_FS_MAGIC, KOVA_FS_PSEUDO},
    {PSTOREFS_MAGIC, KOVA_FS_PSEUDO},
    {EFIVARFS_MAGIC, KOVA_FS_PSEUDO},
    {HUGETLBFS_MAGIC, KOVA_FS_PSEUDO},
    {BINFMTFS_MAGIC, KOVA_FS_PSEUDO},
    {NSFS_MAGIC, KOVA_FS_PSEUDO},
    {AUTOFS_SUPER_MAGIC, KOVA_FS_PSEUDO},
    {RDTGROUP_SUPER_MAGIC, KOVA_FS_PSEUDO},
    {0x19800202 /* mqueue */, KOVA_FS_PSEUDO},
    {0x62656570 /* configfs */, KOVA_FS_PSEUDO},
    {0x65735543 /* fusectl */, KOVA_FS_PSEUDO},
    {0x67596969 /* rpc_pipefs */, KOVA_FS_PSEUDO},
};

struct FuseRow {
  const char* name;
  int type;
};

/// What stands behind a FUSE mount, by the name after "fuse."; others are local.
constexpr FuseRow kFuseTypes[] = {
    {"sshfs", KOVA_FS_FUSE_REMOTE},      {"curlftpfs", KOVA_FS_FUSE_REMOTE}, {"davfs", KOVA_FS_FUSE_REMOTE},
    {"davfs2", KOVA_FS_FUSE_REMOTE},     {"rclone", KOVA_FS_FUSE_REMOTE},    {"s3fs", KOVA_FS_FUSE_REMOTE},
    {"goofys", KOVA_FS_FUSE_REMOTE},     {"gcsfuse", KOVA_FS_FUSE_REMOTE},   {"glusterfs", KOVA_FS_FUSE_REMOTE},
    {"ceph", KOVA_FS_FUSE_REMOTE},       {"ceph-fuse", KOVA_FS_FUSE_REMOTE}, {"gvfsd-fuse", KOVA_FS_FUSE_REMOTE},
    {"kio-fuse", KOVA_FS_FUSE_REMOTE},   {"smbnetfs", KOVA_FS_FUSE_REMOTE},  {"juicefs", KOVA_FS_FUSE_REMOTE},
    {"moosefs", KOVA_FS_FUSE_REMOTE},    {"jmtpfs", KOVA_FS_FUSE_REMOTE},    {"simple-mtpfs", KOVA_FS_FUSE_REMOTE},
    {"portal", KOVA_FS_PSEUDO},          {"lxcfs", KOVA_FS_PSEUDO},          {"squashfuse", KOVA_FS_SQUASHFS},
    {"squashfuse_ll", KOVA_FS_SQUASHFS}, {"fuseiso", KOVA_FS_ISO9660},       {"ntfs-3g", KOVA_FS_NTFS},
};

int FuseType(const std::string& path) {
  const std::string mounted = kova::host::MountedAt(path).type;
  if (mounted == "fuseblk") return KOVA_FS_NTFS;
  const std::string name = mounted.compare(0, 5, "fuse.") == 0 ? mounted.substr(5) : mounted;
  for (const FuseRow& row : kFuseTypes) {
    if (name == row.name) return row.type;
  }
  return KOVA_FS_FUSE;
}

}  // namespace

int KOVAGetFSType(const char* path, int follow_mount) {
  (void)follow_mount;
  if (path == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  struct statfs info = {};
  if (statfs(path, &info) != 0) return KOVA_FAIL_ERRNO();
  const auto magic = static_cast<uint32_t>(info.f_type);
  if (magic == FUSE_SUPER_MAGIC) return FuseType(path);
  for (const MagicRow& row : kMagics) {
    if (row.magic == magic) return row.type;
  }
  return KOVA_FS_UNKNOWN;
}

int KOVAFSDirIsMntPoint(const char* path) {
  if (path == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  struct stat info = {};
  if (lstat(path, &info) != 0) return KOVA_FAIL_ERRNO();
  if (!S_ISDIR(info.st_mode)) return 0;
  const int is_root = kova::host::IsMountRoot(path);
  if (is_root < 0) return KOVA_FAIL_ERRNO();
  if (is_root == 0) return 0;
  const std::shared_ptr<const kova::host::ShareTable> table = kova::host::ShareTable::Current();
  const kova::host::ShareEntry* share = table != nullptr ? table->ByFullPath(path) : nullptr;
  return share != nullptr && share->path == path ? 0 : 1;
}

int KOVAACLPermGet(const char* path) {
  if (path == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  if (faccessat(AT_FDCWD, path, F_OK, AT_EACCESS) != 0) return KOVA_FAIL_ERRNO();
  int mask = 0;
  for (const int permission : {KOVA_PERM_READ, KOVA_PERM_WRITE, KOVA_PERM_EXECUTE}) {
    if (faccessat(AT_FDCWD, path, permission, AT_EACCESS) == 0) mask |= permission;
  }
  return mask;
}
