#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// An entry of a POSIX ACL that a file's mode does not tell: the mode's bits are its owner, mask and other.
struct AclEntry {
  enum class Kind : uint8_t { kUser, kOwningGroup, kGroup };
  Kind kind;
  uint8_t permissions;  ///< 4 read, 2 write, 1 execute
  uint32_t id;          ///< of the user or group; 0 for kOwningGroup
};

/// Who may do what with a file: the member "_KOVAAccess", `UID:GID:MODE` or `UID:GID:MODE:ACL`.
struct AccessRecord {
  int64_t number = 0;  ///< in the table "access"
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

/// Reads the records with the numbers from `first` to `last`, in their order. @throws Error kEngineStorage.
void ReadAccessRecords(Database& database, int64_t first, int64_t last,
                       const std::function<void(const AccessRecord&)>& take);

/// The table "access" as the thread that writes uses it: each distinct record once, by the number that documents and
/// folders refer to it by. Numbers count from 1 and never change; records that nothing refers to any more stay, since
/// they are few. What was read is kept, up to kKeptMaxBytes. Members throw Error kEngineStorage.
class AccessRecords {
 public:
  static constexpr int64_t kNone = 0;  ///< no record

  /// `database` must outlive this.
  explicit AccessRecords(Database& database) : database_(database) {}

  /// The number of the record that is the value of the member field::kAccess: its text, or null for none. Gives it one
  /// when it has none, within the caller's transaction. @throws Error kEngineBadRequest when it is no record.
  int64_t NumberOf(const Json::Value& member);
  int64_t NumberOf(const std::string& text);
  std::string TextOf(int64_t number);
  /// To be called after a rollback: drops what was kept.
  void Forget();

 private:
  static constexpr size_t kKeptMaxBytes = 1 << 20;

  void Keep(const std::string& text, int64_t number);

  Database& database_;
  std::unordered_map<std::string, int64_t> numbers_;
  std::unordered_map<int64_t, std::string> texts_;
  size_t kept_bytes_ = 0;
};

}  // namespace ferrox::engine
