#include <cstring>

#include <kova/file_index.h>
#include <kova/recycle.h>
#include <kova/share.h>

#include "base/path.h"
#include "platform/shared/failure.h"
#include "platform/shared/index_paths.h"
#include "platform/shared/records.h"
#include "tests/support/fake_platform.h"

using ferrox::test::FakeCallFails;
using ferrox::test::FakePlatform;
using ferrox::test::FakeShare;

namespace {

int FlagGet(const char* function, const KOVAShare* share, int FakeShare::*flag, int* value) {
  if (FakeCallFails(function, share->name)) return -1;
  const auto found = FakePlatform::Get().shares.find(share->name);
  if (found == FakePlatform::Get().shares.end()) return KOVA_FAIL(KOVA_ERR_NO_SUCH_SHARE);
  *value = found->second.*flag;
  return 0;
}

int AnyHolds(const std::set<std::string>& folders, const std::string& path) {
  for (const std::string& folder : folders) {
    if (base::IsAtOrBelow(path, folder)) return 1;
  }
  return 0;
}

constexpr int kEveryHome = -1;

/// The home recycle bins of accounts of these kinds; how many, or below 0.
int PushHomeRecyclePaths(KLIBCSzList** list, int auth_types) {
  if (list == nullptr || *list == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  int count = 0;
  for (const auto& [path, auth] : FakePlatform::Get().home_recycle_paths) {
    if (auth_types != kEveryHome && (auth & auth_types) == 0) continue;
    if (KLIBCSzListPush(list, path.c_str()) < 0) return -1;
    ++count;
  }
  return count;
}

/// Gives out what was composed; the reason of an empty text is recorded already.
int Give(const std::string& composed, char* buffer, size_t size) {
  return !composed.empty() && kova::CopyOut(composed, buffer, size) ? 0 : -1;
}

}  // namespace

int KOVAShareGet(const char* name, KOVAShare** share) {
  if (FakeCallFails(__func__, name)) return -1;
  const auto found = FakePlatform::Get().shares.find(name);
  if (found == FakePlatform::Get().shares.end()) return KOVA_FAIL(KOVA_ERR_NO_SUCH_SHARE);
  *share = kova::NewShare(name, found->second.path, found->second.ftp_privilege, 0);
  return 0;
}

int KLIBShareEnum(KLIBCSzList** list, const KOVAShareFilter* filter) {
  if (FakeCallFails(__func__, "")) return -1;
  int count = 0;
  for (const auto& [name, share] : FakePlatform::Get().shares) {
    if (filter != nullptr && filter->skip_encrypted != 0 && share.encryption != 0) continue;
    if (KLIBCSzListPush(list, name.c_str()) < 0) return -1;
    ++count;
  }
  return count;
}

int KOVAShareNamePathGet(const char* full_path, char* name, size_t name_size, char* share_path,
                         size_t share_path_size) {
  if (FakeCallFails(__func__, full_path)) return -1;
  const std::pair<const std::string, FakeShare>* best = nullptr;
  for (const auto& entry : FakePlatform::Get().shares) {
    if (!base::IsAtOrBelow(full_path, entry.second.path)) continue;
    if (best == nullptr || entry.second.path.size() > best->second.path.size()) best = &entry;
  }
  if (best == nullptr) return KOVA_FAIL(KOVA_ERR_NO_SUCH_SHARE);
  const std::string below = std::string(full_path).substr(best->second.path.size());
  const bool fits = kova::CopyOut(best->first, name, name_size) &&
                    kova::CopyOut("/" + best->first + below, share_path, share_path_size);
  return fits ? 0 : -1;
}

int KLIBShareRecycleStatusGet(const KOVAShare* share, int* value) {
  return FlagGet(__func__, share, &FakeShare::recycle, value);
}
int KLIBShareIsEncryptionGet(const KOVAShare* share, int* value) {
  return FlagGet(__func__, share, &FakeShare::encryption, value);
}
int KLIBShareIsEncryptedGet(const KOVAShare* share, int* value) {
  return FlagGet(__func__, share, &FakeShare::encrypted, value);
}
int KLIBShareIsReadOnlyGet(const KOVAShare* share, int* value) {
  return FlagGet(__func__, share, &FakeShare::read_only, value);
}
int KLIBShareHideUnreadableGet(const KOVAShare* share, int* value) {
  return FlagGet(__func__, share, &FakeShare::hide_unreadable, value);
}

int KOVAShareUserPrivGet(const char* user, const KOVAShare* share) {
  if (FakeCallFails(__func__, std::string(user) + ", " + share->name)) return -1;
  const FakePlatform& platform = FakePlatform::Get();
  if (platform.users.count(user) == 0) return KOVA_FAIL(KOVA_ERR_NO_SUCH_USER);
  const auto found = platform.shares.find(share->name);
  if (found == platform.shares.end()) return KOVA_FAIL(KOVA_ERR_NO_SUCH_SHARE);
  const auto privilege = found->second.privileges.find(user);
  return privilege == found->second.privileges.end() ? static_cast<int>(KOVA_PRIV_READ_WRITE) : privilege->second;
}

int KOVAQuotaIsEnough(uint32_t uid, const char* path, int64_t bytes) {
  if (FakeCallFails(__func__, std::to_string(uid) + ", " + path + ", " + std::to_string(bytes))) return 0;
  return FakePlatform::Get().quota_enough;
}

int FILEIDXGetIndexID(const char* share_name, char* buffer, size_t size) {
  if (FakeCallFails(__func__, share_name)) return -1;
  return Give(std::string("fileindex_") + share_name, buffer, size);
}
int FILEIDXDBPathCompose(const char* share_path, char* buffer, size_t size) {
  if (FakeCallFails(__func__, share_path)) return -1;
  const std::optional<std::string>& scripted = FakePlatform::Get().composed_db_path;
  if (scripted) return kova::CopyOut(*scripted, buffer, size) ? 0 : -1;
  return Give(kova::ComposeDBPath(share_path), buffer, size);
}
int FILEIDXQueuePathCompose(const char* share_path, char* buffer, size_t size) {
  if (FakeCallFails(__func__, share_path)) return -1;
  return Give(kova::ComposeQueuePath(share_path), buffer, size);
}

int KOVAShareIsShareRecycle(const char* full_path) {
  if (FakeCallFails(__func__, full_path)) return -1;
  return AnyHolds(FakePlatform::Get().recycle_bins, full_path);
}
int KOVARecycleUserHomePathIsExist(const char* full_path, int auth_types) {
  if (FakeCallFails(__func__, std::string(full_path) + ", " + std::to_string(auth_types))) return -1;
  return AnyHolds(FakePlatform::Get().home_recycle_bins, full_path);
}

int KOVARecycleHomeEnumRecyclePath(KLIBCSzList** list) {
  return FakeCallFails(__func__, "") ? -1 : PushHomeRecyclePaths(list, kEveryHome);
}
int KOVARecycleHomeEnumRecyclePathForAuthType(KLIBCSzList** list, AUTH_TYPE auth) {
  return FakeCallFails(__func__, std::to_string(auth)) ? -1 : PushHomeRecyclePaths(list, auth);
}
