#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace base {

/// An entry of a POSIX ACL that a file's mode does not tell: the mode's bits are its owner, mask and other.
struct AclEntry {
  enum class Kind : uint8_t { kUser, kOwningGroup, kGroup };
  Kind kind;
  uint8_t permissions;  ///< 4 read, 2 write, 1 execute
  uint32_t id;          ///< of the user or group; 0 for kOwningGroup
};

/// Who may do what with a file: the document's member "_KOVAAccess", `UID:GID:MODE` or `UID:GID:MODE:ACL`
/// (docs/formats/engine.md).
struct AccessRecord {
  uint32_t uid = 0;
  uint32_t gid = 0;
  uint16_t mode = 0;          ///< permission bits: 07777 at most
  std::vector<AclEntry> acl;  ///< in the kernel's order: users, owning group, groups; empty: the mode tells all
};

/// What a record must be, for refusals.
inline constexpr char kAccessSpelling[] = "a text like 1000:100:0640 or 1000:100:0640:u5001=4,g=4,g200=6";
/// Nothing when the text is no record, or not spelt as AccessText spells it.
std::optional<AccessRecord> ParseAccess(std::string_view text);
std::string AccessText(const AccessRecord& record);

/// The last part of the text alone: users, the owning group once, groups.
std::optional<std::vector<AclEntry>> ParseAcl(std::string_view text);
std::string AclText(const std::vector<AclEntry>& acl);

}  // namespace base
