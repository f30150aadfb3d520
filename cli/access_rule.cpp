#include "cli/access_rule.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>

namespace ferrox::cli {

namespace {

/// An entry of an ACL, "u5001=4", "g=4" or "g200=6".
struct AccessEntry {
  bool of_user = false;
  bool of_owning_group = false;
  uint32_t id = 0;
  unsigned bits = 0;
};

/// "UID:GID:MODE[:ACL]" by its parts.
struct ParsedAccess {
  uint32_t owner = 0;
  uint32_t group = 0;
  unsigned mode = 0;
  std::vector<AccessEntry> acl;
};

uint32_t ToId(const std::string& digits) { return static_cast<uint32_t>(strtoul(digits.c_str(), nullptr, 10)); }

/// False for what is no record. The index and the platform write them; nothing else is expected here.
bool ParseAccess(const std::string& text, ParsedAccess& access) {
  const std::vector<std::string> parts = Split(text, ':');
  if (parts.size() != 3 && parts.size() != 4) return false;
  access.owner = ToId(parts[0]);
  access.group = ToId(parts[1]);
  access.mode = static_cast<unsigned>(strtoul(parts[2].c_str(), nullptr, 8));
  if (parts.size() == 3) return true;
  for (const std::string& part : Split(parts[3], ',')) {
    const size_t equals = part.find('=');
    if (equals == std::string::npos || equals == 0) return false;
    AccessEntry entry;
    entry.of_user = part[0] == 'u';
    entry.of_owning_group = part.compare(0, equals, "g") == 0;
    entry.id = ToId(part.substr(1, equals - 1));
    entry.bits = static_cast<unsigned>(strtoul(part.c_str() + equals + 1, nullptr, 8));
    access.acl.push_back(entry);
  }
  return true;
}

bool IsIn(const AskedUser& user, gid_t group) {
  return std::find(user.groups.begin(), user.groups.end(), group) != user.groups.end();
}

std::string NameOf(const AccessEntry& entry) {
  if (entry.of_owning_group) return "the ACL's entry for the owning group";
  return std::string("the ACL's entry for ") + (entry.of_user ? "user " : "group ") + std::to_string(entry.id);
}

/// What an entry gives, of which the mask leaves a part.
AccessDecision ByEntry(const AccessEntry& entry, unsigned mask, unsigned wanted) {
  const bool given = (entry.bits & wanted) != 0;
  const bool left = (mask & wanted) != 0;
  return {given && left, NameOf(entry) + (given && !left ? ", of which the ACL's mask does not leave it" : "")};
}

AccessDecision ByAcl(const ParsedAccess& access, const AskedUser& user, unsigned wanted) {
  const unsigned mask = access.mode >> 3;
  std::string refused;
  for (const AccessEntry& entry : access.acl) {
    if (entry.of_user) {
      if (entry.id == user.uid) return ByEntry(entry, mask, wanted);
    } else if (IsIn(user, entry.of_owning_group ? access.group : entry.id)) {
      if ((entry.bits & wanted) != 0) return ByEntry(entry, mask, wanted);
      refused += (refused.empty() ? "" : " and ") + NameOf(entry);
    }
  }
  if (!refused.empty()) return {false, refused};
  return {(access.mode & wanted) != 0, "the mode's bits for others, since no entry of the ACL is for this user"};
}

}  // namespace

AccessDecision DecideAccess(const std::string& access, const AskedUser& user, Wanted wanted) {
  ParsedAccess parsed;
  if (!ParseAccess(access, parsed)) return {false, "rights that cannot be read"};
  const auto bit = static_cast<unsigned>(wanted);
  if (user.uid == parsed.owner) return {(parsed.mode >> 6 & bit) != 0, "the mode's bits for the owner"};
  const bool acl_counts = (parsed.mode & 070) != 0;
  if (!parsed.acl.empty() && acl_counts) return ByAcl(parsed, user, bit);
  const char* note = parsed.acl.empty() ? "" : ", since an ACL with an empty mask does not count";
  const bool in_group = IsIn(user, parsed.group);
  return {((in_group ? parsed.mode >> 3 : parsed.mode) & bit) != 0,
          std::string("the mode's bits for ") + (in_group ? "the group" : "others") + note};
}

}  // namespace ferrox::cli
