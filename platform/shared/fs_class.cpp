#include <cstring>

#include <kova/fs.h>

int KOVAFSIsRemoteFS(int type) {
  switch (type) {
    case KOVA_FS_NFS:
    case KOVA_FS_CIFS:
    case KOVA_FS_CEPH:
    case KOVA_FS_FUSE_REMOTE:
    case KOVA_FS_OTHER_REMOTE:
      return 1;
    default:
      return 0;
  }
}

int KOVAFSIsImageFS(int type) {
  switch (type) {
    case KOVA_FS_ISO9660:
    case KOVA_FS_UDF:
    case KOVA_FS_SQUASHFS:
    case KOVA_FS_EROFS:
      return 1;
    default:
      return 0;
  }
}

int KOVAEAIsHiddenDir(const char* name) { return name != nullptr && strcmp(name, "@eaDir") == 0 ? 1 : 0; }
