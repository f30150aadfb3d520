#include <algorithm>

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
  return Give(kova::host::FindAccount(static_cast<uid_t>(uid), account), account, user);
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
