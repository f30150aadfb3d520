#pragma once

#include <stdint.h>

/// Users, groups and the process's identity. Not safe for concurrent use, like kova/share.h: callers hold the same
/// mutex. The host's user database answers, which may be on another machine: a call may block for as long as that.

#ifdef __cplusplus
extern "C" {
#endif

typedef struct KOVAUser {
  char* name;
  uint32_t uid;
  uint32_t gid;  ///< the primary group
  char* home;
} KOVAUser;

/// Look a user up. 0 and a record that the caller frees with KOVAUserFree, or below 0.
int KOVAUserGet(const char* name, KOVAUser** user);
int KOVAUserGetByUID(uint32_t uid, KOVAUser** user);
void KOVAUserFree(KOVAUser* user);

/// 1 when the user is an administrator (root, or a member of the configured group), 0 when not, below 0 on failure.
int KLIBGroupIsAdminGroupMem(const char* name, int only_local);

/// 1 when the user's home service is on, 0 when it is off, below 0 on failure.
int KOVAServiceUserHomeIsEnabled(uint32_t auth_type, const KOVAUser* user);

#ifdef __cplusplus
}

/// Sets the effective user and group of the process to those of `name`. In an instance whose processes are not root,
/// switching to "root" or to the instance's owner succeeds without doing anything, to anybody else it fails.
bool ResetCredentialsByName(const char* name, bool reset_groups);
#endif
