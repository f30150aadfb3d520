#include "platform/host/privilege.h"

#include <endian.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstring>
#include <vector>

#include <kova/fs.h>

#include "platform/host/accounts.h"
#include "platform/shared/failure.h"

namespace kova::host {

namespace {

/// The kernel's form of an access control list: a version, then entries, all little-endian.
constexpr char kAclName[] = "system.posix_acl_access";
constexpr size_t kAclHeaderBytes = 4;
constexpr size_t kAclEntryBytes = 8;
enum AclTag : uint16_t { kUser = 0x02, kGroupObject = 0x04, kGroup = 0x08, kMask = 0x10 };

struct AclEntry {
  uint16_t tag;
  int permissions;
  uint32_t id;
};

std::vector<AclEntry> ReadAcl(const std::string& path) {
  std::array<unsigned char, 8192> raw;
  const ssize_t size = getxattr(path.c_str(), kAclName, raw.data(), raw.size());
  std::vector<AclEntry> entries;
  for (size_t at = kAclHeaderBytes; size > 0 && at + kAclEntryBytes <= static_cast<size_t>(size);
       at += kAclEntryBytes) {
    uint16_t tag, permissions;
    uint32_t id;
    memcpy(&tag, raw.data() + at, sizeof(tag));
    memcpy(&permissions, raw.data() + at + 2, sizeof(permissions));
    memcpy(&id, raw.data() + at + 4, sizeof(id));
    entries.push_back({le16toh(tag), le16toh(permissions) & 7, le32toh(id)});
  }
  return entries;
}

bool Has(const std::vector<gid_t>& groups, uint32_t gid) {
  return std::find(groups.begin(), groups.end(), static_cast<gid_t>(gid)) != groups.end();
}

/// The permissions that the groups give, and whether any group matched.
int GroupPermissions(const std::vector<AclEntry>& acl, const struct stat& info, const std::vector<gid_t>& groups,
                     bool& matched) {
  int permissions = 0;
  matched = Has(groups, info.st_gid);
  if (acl.empty() && matched) permissions = (info.st_mode >> 3) & 7;
  for (const AclEntry& entry : acl) {
    const bool mine =
        (entry.tag == kGroupObject && Has(groups, info.st_gid)) || (entry.tag == kGroup && Has(groups, entry.id));
    if (!mine) continue;
    matched = true;
    permissions |= entry.permissions;
  }
  return permissions;
}

}  // namespace

int UserPermissions(const std::string& user, const std::string& path) {
  Account account;
  if (!FindAccount(user, account)) return -1;
  struct stat info = {};
  if (stat(path.c_str(), &info) != 0) return KOVA_FAIL_ERRNO();
  if (account.uid == 0) return KOVA_PERM_READ | KOVA_PERM_WRITE | KOVA_PERM_EXECUTE;
  if (account.uid == info.st_uid) return (info.st_mode >> 6) & 7;
  const std::vector<AclEntry> acl = ReadAcl(path);
  // With a list, the group bits of the mode are the mask of what named users and groups can get.
  int mask = 7;
  for (const AclEntry& entry : acl) {
    if (entry.tag == kMask) mask = entry.permissions;
  }
  for (const AclEntry& entry : acl) {
    if (entry.tag == kUser && entry.id == account.uid) return entry.permissions & mask;
  }
  bool matched = false;
  const int permissions = GroupPermissions(acl, info, GroupsOf(account), matched);
  return matched ? permissions & mask : static_cast<int>(info.st_mode & 7);
}

}  // namespace kova::host
