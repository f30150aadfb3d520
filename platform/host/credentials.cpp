#include <grp.h>
#include <unistd.h>

#include <cerrno>

#include <kova/instance.h>
#include <kova/user.h>

#include "platform/host/accounts.h"
#include "platform/shared/failure.h"

using kova::host::Account;

namespace {

constexpr uid_t kKeepUid = static_cast<uid_t>(-1);
constexpr gid_t kKeepGid = static_cast<gid_t>(-1);

bool Failed() {
  (void)KOVA_FAIL_ERRNO();
  return false;
}

/// Whether the process may become anybody: root, or root with another effective user for now.
bool MayBecomeRoot() {
  uid_t real = 0, effective = 0, saved = 0;
  if (getresuid(&real, &effective, &saved) != 0) return false;
  return effective == 0 || real == 0 || saved == 0;
}

/// The identity of the process for as long as it takes to change it whole or not at all.
class IdentityChange {
 public:
  IdentityChange() : uid_(geteuid()), gid_(getegid()) {}

  /// Only the effective ids change, so that the way back stays open.
  bool To(const Account& account, bool reset_groups) {
    const bool changed = setresuid(kKeepUid, 0, kKeepUid) == 0 &&
                         (!reset_groups || initgroups(account.name.c_str(), account.gid) == 0) &&
                         setresgid(kKeepGid, account.gid, kKeepGid) == 0 &&
                         setresuid(kKeepUid, account.uid, kKeepUid) == 0;
    return changed || Back();
  }

 private:
  bool Back() {
    const int saved_errno = errno;
    (void)!setresgid(kKeepGid, gid_, kKeepGid);
    (void)!setresuid(kKeepUid, uid_, kKeepUid);
    errno = saved_errno;
    return Failed();
  }

  uid_t uid_;
  gid_t gid_;
};

}  // namespace

bool ResetCredentialsByName(const char* name, bool reset_groups) {
  if (name == nullptr) {
    (void)KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
    return false;
  }
  const bool to_root = std::string(name) == "root";
  const bool may_become_root = MayBecomeRoot();
  if (!may_become_root && to_root && !kova::InstanceRoot().empty()) return true;
  Account account;
  if (!kova::host::FindAccount(std::string(name), account)) return false;
  if (may_become_root) return IdentityChange().To(account, reset_groups);
  if (account.uid == geteuid()) return true;
  errno = EPERM;
  return Failed();
}
