#include <sys/statvfs.h>

#include <kova/fs.h>
#include <kova/share.h>

#include "platform/host/privilege.h"
#include "platform/host/share_table.h"
#include "platform/shared/failure.h"
#include "platform/shared/records.h"

using kova::host::ShareEntry;
using kova::host::ShareTable;

namespace {

/// The bits of KOVAShare::flags.
enum : uint32_t { kRecycle = 1, kEncrypted = 2, kLocked = 4, kReadOnly = 8, kHideUnreadable = 16 };

uint32_t Flags(const ShareEntry& entry) {
  return (entry.recycle.empty() ? 0U : kRecycle) | (entry.encrypted ? kEncrypted : 0U) | (entry.locked ? kLocked : 0U) |
         (entry.read_only ? kReadOnly : 0U) | (entry.hide_unreadable ? kHideUnreadable : 0U);
}

int FlagGet(const KOVAShare* share, uint32_t flag, int* value) {
  if (share == nullptr || value == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  *value = (share->flags & flag) != 0 ? 1 : 0;
  return 0;
}

}  // namespace

int KOVAShareGet(const char* name, KOVAShare** share) {
  if (name == nullptr || share == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  *share = nullptr;
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (table == nullptr) return -1;
  const ShareEntry* entry = table->ByName(name);
  if (entry == nullptr) return KOVA_FAIL(KOVA_ERR_NO_SUCH_SHARE);
  *share = kova::NewShare(entry->name, entry->path, entry->ftp_privilege, Flags(*entry));
  return 0;
}

int KLIBShareEnum(KLIBCSzList** list, const KOVAShareFilter* filter) {
  if (list == nullptr || *list == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (table == nullptr) return -1;
  int count = 0;
  for (const ShareEntry& entry : table->Entries()) {
    if (filter != nullptr && filter->skip_encrypted != 0 && entry.encrypted) continue;
    if (KLIBCSzListPush(list, entry.name.c_str()) < 0) return -1;
    ++count;
  }
  return count;
}

int KOVAShareNamePathGet(const char* full_path, char* name, size_t name_size, char* share_path,
                         size_t share_path_size) {
  if (full_path == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  const std::shared_ptr<const ShareTable> table = ShareTable::Current();
  if (table == nullptr) return -1;
  const ShareEntry* entry = table->ByFullPath(full_path);
  if (entry == nullptr) return KOVA_FAIL(KOVA_ERR_NO_SUCH_SHARE);
  const std::string below = std::string(full_path).substr(entry->path.size());
  const bool fits = kova::CopyOut(entry->name, name, name_size) &&
                    kova::CopyOut("/" + entry->name + below, share_path, share_path_size);
  return fits ? 0 : -1;
}

int KLIBShareRecycleStatusGet(const KOVAShare* share, int* value) { return FlagGet(share, kRecycle, value); }
int KLIBShareIsEncryptionGet(const KOVAShare* share, int* value) { return FlagGet(share, kEncrypted, value); }
int KLIBShareIsEncryptedGet(const KOVAShare* share, int* value) { return FlagGet(share, kLocked, value); }
int KLIBShareHideUnreadableGet(const KOVAShare* share, int* value) { return FlagGet(share, kHideUnreadable, value); }

int KLIBShareIsReadOnlyGet(const KOVAShare* share, int* value) {
  if (FlagGet(share, kReadOnly, value) < 0) return -1;
  struct statvfs volume = {};
  if (statvfs(share->path, &volume) != 0) return KOVA_FAIL_ERRNO();
  if ((volume.f_flag & ST_RDONLY) != 0) *value = 1;
  return 0;
}

int KOVAShareUserPrivGet(const char* user, const KOVAShare* share) {
  if (user == nullptr || share == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  const int permissions = kova::host::UserPermissions(user, share->path);
  if (permissions < 0) return -1;
  constexpr int kLook = KOVA_PERM_READ | KOVA_PERM_EXECUTE;
  if ((permissions & kLook) != kLook) return KOVA_PRIV_DENIED;
  int read_only = 0;
  if (KLIBShareIsReadOnlyGet(share, &read_only) < 0) return -1;
  return read_only == 0 && (permissions & KOVA_PERM_WRITE) != 0 ? KOVA_PRIV_READ_WRITE : KOVA_PRIV_READ_ONLY;
}
