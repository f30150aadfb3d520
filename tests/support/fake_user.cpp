#include <kova/user.h>

#include "platform/shared/failure.h"
#include "platform/shared/records.h"
#include "tests/support/fake_platform.h"

using ferrox::test::FakeCallFails;
using ferrox::test::FakePlatform;

int KOVAUserGet(const char* name, KOVAUser** user) {
  if (FakeCallFails(__func__, name)) return -1;
  const auto found = FakePlatform::Get().users.find(name);
  if (found == FakePlatform::Get().users.end()) return KOVA_FAIL(KOVA_ERR_NO_SUCH_USER);
  *user = kova::NewUser(name, found->second.uid, found->second.gid, found->second.home);
  return 0;
}

int KOVAUserGetByUID(uint32_t uid, KOVAUser** user) {
  if (FakeCallFails(__func__, std::to_string(uid))) return -1;
  for (const auto& [name, fake] : FakePlatform::Get().users) {
    if (fake.uid != uid) continue;
    *user = kova::NewUser(name, fake.uid, fake.gid, fake.home);
    return 0;
  }
  return KOVA_FAIL(KOVA_ERR_NO_SUCH_USER);
}

int KLIBGroupIsAdminGroupMem(const char* name, int only_local) {
  if (FakeCallFails(__func__, std::string(name) + ", " + std::to_string(only_local))) return -1;
  const auto found = FakePlatform::Get().users.find(name);
  if (found == FakePlatform::Get().users.end()) return KOVA_FAIL(KOVA_ERR_NO_SUCH_USER);
  return found->second.admin ? 1 : 0;
}

int KOVAServiceUserHomeIsEnabled(uint32_t auth_type, const KOVAUser* user) {
  if (FakeCallFails(__func__, std::to_string(auth_type) + ", " + user->name)) return -1;
  const auto found = FakePlatform::Get().users.find(user->name);
  return found == FakePlatform::Get().users.end() ? 0 : found->second.home_service;
}

bool ResetCredentialsByName(const char* name, bool reset_groups) {
  if (FakeCallFails(__func__, std::string(name) + ", " + (reset_groups ? "true" : "false"))) return false;
  FakePlatform& platform = FakePlatform::Get();
  const auto found = platform.users.find(name);
  if (found == platform.users.end()) {
    (void)KOVA_FAIL(KOVA_ERR_NO_SUCH_USER);
    return false;
  }
  platform.switches.emplace_back(name);
  platform.euid = found->second.uid;
  platform.egid = found->second.gid;
  return true;
}
