#pragma once

#include <kova/string_list.h>

/// Recycle bins: folders into which a deletion over the network only moves a file.

#ifdef __cplusplus
extern "C" {
#endif

/// 1 when `full_path` lies in the recycle bin of its share, else 0.
int KOVAShareIsShareRecycle(const char* full_path);
/// 1 when `full_path` lies in the recycle bin of a user's home, else 0. `auth_types` selects the kinds of users.
int KOVARecycleUserHomePathIsExist(const char* full_path, int auth_types);

/// Where accounts come from; the values may be combined to a set.
typedef enum AUTH_TYPE {
  AUTH_LOCAL = 1,   ///< this host's own user table
  AUTH_DOMAIN = 2,  ///< a Windows domain
  AUTH_LDAP = 8,    ///< a directory service
} AUTH_TYPE;

/// Append the full paths of the recycle bins that exist in the homes of users, all or those of one kind of accounts, to
/// `*list`, in no order. A link is no recycle bin, and a home that cannot be read has none. 0 or more: how many; below
/// 0 on failure. Without a share "homes" there are none.
int KOVARecycleHomeEnumRecyclePath(KLIBCSzList** list);
int KOVARecycleHomeEnumRecyclePathForAuthType(KLIBCSzList** list, AUTH_TYPE auth);

#ifdef __cplusplus
}
#endif
