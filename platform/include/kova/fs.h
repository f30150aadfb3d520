#pragma once

#include <stdint.h>

#include <kova/string_list.h>

/// File systems, mount points, snapshots, permissions, copies. Paths are absolute and zero-ended. Each call asks the
/// kernel and may block for as long as the file system that holds the path does. All may be called by several threads
/// at once; failures are recorded for the calling thread (kova/error.h).

#ifdef __cplusplus
extern "C" {
#endif

/// File-system type codes. 12 is never indexed; the other numbers only tell the classes below apart. From 32 on the
/// files live on another machine, from 64 on in a mounted image.
enum {
  KOVA_FS_UNKNOWN = 0,  ///< none of those below
  KOVA_FS_EXT = 1,      ///< ext2, ext3, ext4
  KOVA_FS_BTRFS = 2,
  KOVA_FS_XFS = 3,
  KOVA_FS_TMPFS = 4,  ///< in memory; ramfs, too
  KOVA_FS_OVERLAY = 5,
  KOVA_FS_FAT = 6,   ///< FAT12 to FAT32, exFAT
  KOVA_FS_NTFS = 7,  ///< by the kernel or by FUSE
  KOVA_FS_ZFS = 8,
  KOVA_FS_F2FS = 9,
  KOVA_FS_FUSE = 10,    ///< a FUSE file system of which it is not known that it is remote
  KOVA_FS_PSEUDO = 12,  ///< proc, sysfs, devpts, cgroup and the like: no files of a user
  KOVA_FS_NFS = 32,
  KOVA_FS_CIFS = 33,  ///< SMB in any version
  KOVA_FS_CEPH = 34,
  KOVA_FS_FUSE_REMOTE = 35,   ///< sshfs, rclone, davfs and the like
  KOVA_FS_OTHER_REMOTE = 36,  ///< AFS, Coda, NCP, Lustre
  KOVA_FS_ISO9660 = 64,
  KOVA_FS_UDF = 65,
  KOVA_FS_SQUASHFS = 66,  ///< cramfs, too
  KOVA_FS_EROFS = 67,
};

/// The type code of the file system that holds `path`, KOVA_FS_UNKNOWN for one that is not listed; below 0 when it
/// cannot be asked. `follow_mount` is unused, 0. Links are followed: the answer is for what `path` leads to.
int KOVAGetFSType(const char* path, int follow_mount);
/// 1 for a type whose files live on another machine, else 0.
int KOVAFSIsRemoteFS(int type);
/// 1 for a type that is a mounted image, else 0.
int KOVAFSIsImageFS(int type);
/// 1 when `path` is a directory on which something is mounted, 0 when not, below 0 when it cannot be asked. A share's
/// own folder never counts: a whole volume, or a bind mount, may well be a share. Links are not followed: one to a
/// mount point is none.
int KOVAFSDirIsMntPoint(const char* path);

/// Whether `path` lies in a snapshot, confirmed by the file system. 0 with `*in_snapshot` 1 or 0; below 0 on failure.
/// It does when it has a folder named "#snapshot", ".snapshots" or ".zfs/snapshot", and this one, or one below it on
/// the way to `path`, is a read-only btrfs subvolume or a read-only mount. The name alone makes no snapshot. Only a
/// path that is not absolute is a failure (KOVA_ERR_BAD_PARAMETER); that something is there is not asked for.
int KLIBFhsPathInSnapshot(const char* path, int* in_snapshot);
/// 1 when `name`, one name and not a path, is that of the platform's metadata directory ("@eaDir"), else 0.
int KOVAEAIsHiddenDir(const char* name);

enum { KOVA_PERM_READ = 4, KOVA_PERM_WRITE = 2, KOVA_PERM_EXECUTE = 1 };
/// The calling user's permissions on `path` as a mask of KOVA_PERM_*; below 0 on failure. The effective identity counts
/// (kova/user.h), and access control lists with it. On a read-only file system nobody has KOVA_PERM_WRITE. A path that
/// is not there, or that the user cannot reach, is a failure and not an empty mask.
int KOVAACLPermGet(const char* path);

/// Options of a copy. words[0] = 1: overwrite; words[1] = 1: move (delete the source afterwards).
typedef struct KOVAFileCopyOptions {
  uint32_t words[16];
} KOVAFileCopyOptions;
/// Copies or moves the file `src` (only a regular one is copied) to `dst`, with its mode, owner and times; `flag` is
/// passed over. The copy is written beside `dst`, synced and renamed, so that `dst` is the old file or the whole new
/// one. Without "overwrite" a file that is there already is a failure (errno EEXIST). 0, or below 0 with `dst` as it
/// was before. Blocks for as long as the copy takes. Where the process may not set the owner, the copy belongs to the
/// calling user and loses its set-user and set-group bits.
///
/// A move is a rename wherever that is possible, and then takes any kind of file, a folder too. To another file system
/// it is a copy, and `src` is removed at the end; when only that fails, the call fails and both files are there. A
/// process that is killed may leave the unfinished copy, ".kova-copy." and six letters, in the folder of `dst`.
int KOVAFileCopy(const char* src, const char* dst, const KOVAFileCopyOptions* options, int flag);

#ifdef __cplusplus
}
#endif
