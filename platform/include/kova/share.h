#pragma once

#include <stddef.h>
#include <stdint.h>

#include <kova/string_list.h>

/// Shared folders: records, flags, quota, and which share a path lies in. Not safe for concurrent use: callers hold one
/// process-wide mutex around these calls. Each returns 0 or more for success and below 0 for failure (see kova/error.h)
/// unless it says otherwise.

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KOVAShare {
  char* name;              ///< the share's name, for example "photo"
  char* path;              ///< its absolute folder, for example "/volume1/photo"
  uint32_t ftp_privilege;  ///< 0 none, 1 read only, 2 read and write
  uint32_t flags;          ///< the implementation's own
} KOVAShare;

/// Which shares an enumeration returns. All bits zero: every share.
typedef struct KOVAShareFilter {
  uint32_t skip_encrypted;
} KOVAShareFilter;

/// Looks a share up by its exact name. On success `*share` is a record that the caller frees with KOVAShareFree.
int KOVAShareGet(const char* name, KOVAShare** share);
void KOVAShareFree(KOVAShare* share);

/// Appends the names of all shares that pass `filter` to `*list`, in ascending byte order.
int KLIBShareEnum(KLIBCSzList** list, const KOVAShareFilter* filter);

/// Which share `full_path` lies in: its name, and the path as seen from the volume ("/photo/a.jpg"). Decided on whole
/// path components, the deepest share first; the path itself need not exist.
int KOVAShareNamePathGet(const char* full_path, char* name, size_t name_size, char* share_path, size_t share_path_size);

/// Each sets `*value` to 1 for yes and 0 for no.
int KLIBShareRecycleStatusGet(const KOVAShare* share, int* value);
int KLIBShareIsEncryptionGet(const KOVAShare* share, int* value);  ///< an encrypted share, open or not
int KLIBShareIsEncryptedGet(const KOVAShare* share, int* value);   ///< encrypted and locked now
int KLIBShareIsReadOnlyGet(const KOVAShare* share, int* value);
int KLIBShareHideUnreadableGet(const KOVAShare* share, int* value);

enum { KOVA_PRIV_DENIED = 0, KOVA_PRIV_READ_ONLY = 1, KOVA_PRIV_READ_WRITE = 2 };
/// What `user` may do on the share: one of KOVA_PRIV_*; below 0 when the user is unknown.
int KOVAShareUserPrivGet(const char* user, const KOVAShare* share);

/// Whether `bytes` more fit on the volume of `path`, and, where the index data of the share at `path` lies elsewhere,
/// on that volume too; for a `uid` other than 0 also within that user's quota. Returns 1 for yes; 0 for no or failure,
/// with KOVA_ERR_OUT_OF_SPACE or KOVA_ERR_OVER_QUOTA when it is really space that lacks.
int KOVAQuotaIsEnough(uint32_t uid, const char* path, int64_t bytes);

#ifdef __cplusplus
}
#endif
