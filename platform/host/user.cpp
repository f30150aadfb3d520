#include <unistd.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include <kova/instance.h>
#include <kova/user.h>

#include "platform/host/accounts.h"
#include "platform/host/configuration.h"
#include "platform/host/share_table.h"
#include "platform/shared/failure.h"
#include "platform/shared/records.h"

using kova::host::Account;

namespace {

int Give(bool found, const Account& account, KOVAUser** user) {
  if (!found) return -1;
  *user = kova::NewUser(account.name, account.uid, account.gid, account.home);
  return 0;
}

/// A process of a user without an account, as containers have them, can become nobody else: its number is name enough
/// for an instance of its own. For a process that can, the name must lead back to the user.
bool IsOwnUserWithoutAccount(uid_t uid) {
  uid_t real = 0, effective = 0, saved = 0;
  if (uid == 0 || kova::InstanceRoot().empty() || getresuid(&real, &effective, &saved) != 0) return false;
  return real == uid && effective == uid && saved == uid;
}

}  // namespace

int KOVAUserGet(const char* name, KOVAUser** user) {
  if (name == nullptr || user == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  *user = nullptr;
  Account account;
  return Give(kova::host::FindAccount(std::string(name), account), account, user);
}

int KOVAUserGetByUID(uint32_t uid, KOVAUser** user) {
  if (user == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  *user = nullptr;
  Account account;
  bool found = kova::host::FindAccount(static_cast<uid_t>(uid), account);
  if (!found && IsOwnUserWithoutAccount(uid)) {
    account = {std::to_string(uid), uid, getegid(), ""};
    found = true;
  }
  return Give(found, account, user);
}

int KLIBGroupIsAdminGroupMem(const char* name, int only_local) {
  (void)only_local;  // the name service does not tell where a group comes from
  if (name == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  Account account;
  if (!kova::host::FindAccount(std::string(name), account)) return -1;
  if (account.uid == 0) return 1;
  const std::shared_ptr<const kova::host::Configuration> configuration = kova::host::GetConfiguration();
  if (!configuration->problem.empty()) return KOVA_FAIL(KOVA_ERR_BAD_CONFIGURATION);
  gid_t admins = 0;
  if (!kova::host::FindGroup(configuration->admin_group, admins)) return 0;
  const std::vector<gid_t> groups = kova::host::GroupsOf(account);
  return std::find(groups.begin(), groups.end(), admins) == groups.end() ? 0 : 1;
}

int KOVAServiceUserHomeIsEnabled(uint32_t auth_type, const KOVAUser* user) {
  (void)auth_type;
  if (user == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  // Homes are served when there is a share for them.
  const std::shared_ptr<const kova::host::ShareTable> table = kova::host::ShareTable::Current();
  if (table == nullptr) return -1;
  return table->ByName("homes") != nullptr ? 1 : 0;
}
