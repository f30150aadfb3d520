#include "services/kovaelasticd/store/access_check.h"

#include <algorithm>

namespace ferrox::engine {

namespace {

bool IsInGroup(const Asker& asker, uint32_t gid) {
  return std::binary_search(asker.groups.begin(), asker.groups.end(), gid);
}

/// With an ACL, the mode's group bits are its mask, and bound all entries but the owner's and that of others.
bool AclGrants(const base::AccessRecord& record, const Asker& asker, unsigned wanted) {
  const unsigned mask = record.mode >> 3;
  bool in_group = false;
  for (const base::AclEntry& entry : record.acl) {
    if (entry.kind == base::AclEntry::Kind::kUser) {
      if (entry.id == asker.uid) return (entry.permissions & mask & wanted) != 0;
      continue;
    }
    if (!IsInGroup(asker, entry.kind == base::AclEntry::Kind::kOwningGroup ? record.gid : entry.id)) continue;
    if ((entry.permissions & wanted) != 0) return (mask & wanted) != 0;
    in_group = true;
  }
  return !in_group && (record.mode & wanted) != 0;
}

/// `wanted`: one bit.
bool Grants(const base::AccessRecord& record, const Asker& asker, unsigned wanted) {
  if (asker.uid == record.uid) return (record.mode >> 6 & wanted) != 0;
  // The kernel does not look at an ACL whose mask is empty.
  if (!record.acl.empty() && (record.mode & 070) != 0) return AclGrants(record, asker, wanted);
  return ((IsInGroup(asker, record.gid) ? record.mode >> 3 : record.mode) & wanted) != 0;
}

}  // namespace

uint8_t PermissionsOf(const base::AccessRecord& record, const Asker& asker) {
  uint8_t permissions = 0;
  for (const uint8_t wanted : {kMayRead, kMayEnter}) {
    if (Grants(record, asker, wanted)) permissions |= wanted;
  }
  return permissions;
}

}  // namespace ferrox::engine
