#pragma once

#include <stdint.h>

#include <kova/string_list.h>

/// File systems, mount points, snapshots, permissions, copies. Paths are absolute and zero-ended. Each call asks the
/// kernel and may block for as long as the file system that holds the path does. All may be called by several threads
/// at once; failures are recorded for the calling thread (kova/error.h).

#ifdef __cplusplus
extern "C" {
#endif

/// File-system type codes. 12 is never indexed; the other numbers only tell the classes below apart.
enum {
  KOVA_FS_UNKNOWN = 0,
  KOVA_FS_EXT = 1,
  KOVA_FS_BTRFS = 2,
  KOVA_FS_XFS = 3,
  KOVA_FS_TMPFS = 4,
  KOVA_FS_OVERLAY = 5,
  KOVA_FS_FAT = 6,
  KOVA_FS_NTFS = 7,
  KOVA_FS_ZFS = 8,
  KOVA_FS_F2FS = 9,
  KOVA_FS_FUSE = 10,
  KOVA_FS_PSEUDO = 12,  ///< proc, sysfs, devpts, cgroup and the like: no files of a user
  KOVA_FS_NFS = 32,
  KOVA_FS_CIFS = 33,
  KOVA_FS_CEPH = 34,
  KOVA_FS_FUSE_REMOTE = 35,
  KOVA_FS_OTHER_REMOTE = 36,
  KOVA_FS_ISO9660 = 64,
  KOVA_FS_UDF = 65,
  KOVA_FS_SQUASHFS = 66,
  KOVA_FS_EROFS = 67,
};

/// The type code of the file system that holds `path`, KOVA_FS_UNKNOWN for one that is not listed; below 0 when it
/// cannot be asked. `follow_mount` is unused, 0.
int KOVAGetFSType(const char* path, int follow_mount);
/// 1 for a type whose files live on another machine, else 0.
int KOVAFSIsRemoteFS(int type);
/// 1 for a type that is a mounted image, else 0.
int KOVAFSIsImageFS(int type);
/// 1 when `path` is a directory on which something is mounted, 0 when not, below 0 when it cannot be asked. A share's
/// own folder never counts: a whole volume, or a bind mount, may well be a share.
int KOVAFSDirIsMntPoint(const char* path);

/// Whether `path` lies in a snapshot, confirmed by the file system. 0 with `*in_snapshot` 1 or 0; below 0 on failure.
int KLIBFhsPathInSnapshot(const char* path, int* in_snapshot);
/// 1 when `name` is the platform's metadata directory, else 0.
int KOVAEAIsHiddenDir(const char* name);

enum { KOVA_PERM_READ = 4, KOVA_PERM_WRITE = 2, KOVA_PERM_EXECUTE = 1 };
/// The calling user's permissions on `path` as a mask of KOVA_PERM_*; below 0 on failure. The effective identity counts
/// (kova/user.h), and access control lists with it.
int KOVAACLPermGet(const char* path);

/// Options of a copy. words[0] = 1: overwrite; words[1] = 1: move (delete the source afterwards).
typedef struct KOVAFileCopyOptions {
  uint32_t words[16];
} KOVAFileCopyOptions;
/// Copies or moves the file `src` (only a regular one is copied) to `dst`, with its mode, owner and times; `flag` is
/// passed over. The copy is written beside `dst`, synced and renamed, so that `dst` is the old file or the whole new
/// one. Without "overwrite" a file that is there already is a failure (errno EEXIST). 0, or below 0 with `dst` as it
/// was before.
int KOVAFileCopy(const char* src, const char* dst, const KOVAFileCopyOptions* options, int flag);

#ifdef __cplusplus
}
#endif
