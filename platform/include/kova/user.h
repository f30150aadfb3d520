#pragma once

#include <stdint.h>

/// Users, groups and the process's identity. Not safe for concurrent use, like kova/share.h: callers hold the same
/// mutex. The host's user database answers, which may be on another machine: a call may block for as long as that.

#ifdef __cplusplus
extern "C" {
#endif

/// A user as the host's database describes it. The record owns its texts; both are zero-ended.
typedef struct KOVAUser {
  char* name;  ///< as the database spells it
  uint32_t uid;
  uint32_t gid;  ///< the primary group
  char* home;    ///< the absolute path of the home folder, which need not be there
} KOVAUser;

/// Look a user up. 0 and a record that the caller frees with KOVAUserFree, or below 0, with `*user` null:
/// KOVA_ERR_NO_SUCH_USER, or KOVA_ERR_SYSTEM when the database cannot be asked. The process's own user needs no account
/// where it runs an instance of its own and can become nobody else: its name is then its number.
int KOVAUserGet(const char* name, KOVAUser** user);
int KOVAUserGetByUID(uint32_t uid, KOVAUser** user);
/// Frees a record and its texts; NULL is allowed.
void KOVAUserFree(KOVAUser* user);

/// 1 when the user is an administrator (root, or a member of the configured group), 0 when not, below 0 on failure. A
/// group that does not exist has no members. `only_local` is passed over on this host.
int KLIBGroupIsAdminGroupMem(const char* name, int only_local);

/// 1 when the user's home service is on, 0 when it is off, below 0 on failure. It is on for all users, of whichever
/// `auth_type`, when there is a share "homes".
int KOVAServiceUserHomeIsEnabled(uint32_t auth_type, const KOVAUser* user);

#ifdef __cplusplus
}

/// Sets the effective user and group of the process to those of `name`. In an instance whose processes are not root,
/// switching to "root" or to the instance's owner succeeds without doing anything, to anybody else it fails. With
/// `reset_groups` the supplementary groups become those of the user. The real ids stay, so that the way back is open.
/// False, with the failure recorded, when it fails: effective user and group are then as before, but supplementary
/// groups that have been set already are not set back.
bool ResetCredentialsByName(const char* name, bool reset_groups);
#endif
