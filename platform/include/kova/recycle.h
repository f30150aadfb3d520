#pragma once

/// Recycle bins: folders into which a deletion over the network only moves a file.

#ifdef __cplusplus
extern "C" {
#endif

/// 1 when `full_path` lies in the recycle bin of its share, else 0.
int KOVAShareIsShareRecycle(const char* full_path);
/// 1 when `full_path` lies in the recycle bin of a user's home, else 0. `auth_types` selects the kinds of users.
int KOVARecycleUserHomePathIsExist(const char* full_path, int auth_types);

#ifdef __cplusplus
}
#endif
