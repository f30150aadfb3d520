#include "cli/access_rule.h"

#include <algorithm>
#include <optional>

#include "base/access_record.h"

namespace ferrox::cli {

namespace {

using base::AclEntry;

bool IsIn(const AskedUser& user, gid_t group) {
  return std::find(user.groups.begin(), user.groups.end(), group) != user.groups.end();
}

std::string NameOf(const AclEntry& entry) {
  if (entry.kind == AclEntry::Kind::kOwningGroup) return "the ACL's entry for the owning group";
  const bool of_user = entry.kind == AclEntry::Kind::kUser;
  return std::string("the ACL's entry for ") + (of_user ? "user " : "group ") + std::to_string(entry.id);
}

/// What an entry gives, of which the mask leaves a part.
AccessDecision ByEntry(const AclEntry& entry, unsigned mask, unsigned wanted) {
  const bool given = (entry.permissions & wanted) != 0;
  const bool left = (mask & wanted) != 0;
  return {given && left, NameOf(entry) + (given && !left ? ", of which the ACL's mask does not leave it" : "")};
}

AccessDecision ByAcl(const base::AccessRecord& access, const AskedUser& user, unsigned wanted) {
  const unsigned mask = access.mode >> 3;
  std::string refused;
  for (const AclEntry& entry : access.acl) {
    if (entry.kind == AclEntry::Kind::kUser) {
      if (entry.id == user.uid) return ByEntry(entry, mask, wanted);
    } else if (IsIn(user, entry.kind == AclEntry::Kind::kOwningGroup ? access.gid : entry.id)) {
      if ((entry.permissions & wanted) != 0) return ByEntry(entry, mask, wanted);
      refused += (refused.empty() ? "" : " and ") + NameOf(entry);
    }
  }
  if (!refused.empty()) return {false, refused};
  return {(access.mode & wanted) != 0, "the mode's bits for others, since no entry of the ACL is for this user"};
}

}  // namespace

AccessDecision DecideAccess(const std::string& access, const AskedUser& user, Wanted wanted) {
  const std::optional<base::AccessRecord> parsed = base::ParseAccess(access);
  if (!parsed.has_value()) return {false, "rights that cannot be read"};
  const auto bit = static_cast<unsigned>(wanted);
  if (user.uid == parsed->uid) return {(parsed->mode >> 6 & bit) != 0, "the mode's bits for the owner"};
  const bool acl_counts = (parsed->mode & 070) != 0;
  if (!parsed->acl.empty() && acl_counts) return ByAcl(*parsed, user, bit);
  const char* note = parsed->acl.empty() ? "" : ", since an ACL with an empty mask does not count";
  const bool in_group = IsIn(user, parsed->gid);
  return {((in_group ? parsed->mode >> 3 : parsed->mode) & bit) != 0,
          std::string("the mode's bits for ") + (in_group ? "the group" : "others") + note};
}

}  // namespace ferrox::cli
