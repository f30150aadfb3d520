#include "services/kovaelasticd/store/access_records.h"

#include <charconv>
#include <cstdio>

#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

namespace {

constexpr uint16_t kModeMax = 07777;
/// What an entry of the cache takes beside its text, about.
constexpr size_t kEntryBytes = 160;

/// The part of `text` before the first `end`, which is cut off together with it; all of it where there is none.
std::string_view Cut(std::string_view& text, char end) {
  const size_t at = text.find(end);
  const std::string_view part = text.substr(0, at);
  text.remove_prefix(at == std::string_view::npos ? text.size() : at + 1);
  return part;
}

template <typename Number>
bool ReadNumber(std::string_view text, int base, Number& number) {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, base);
  return error == std::errc() && end == text.data() + text.size() && !text.empty();
}

std::optional<AclEntry> ParseEntry(std::string_view text) {
  AclEntry entry{AclEntry::Kind::kUser, 0, 0};
  const std::string_view who = Cut(text, '=');
  if (!ReadNumber(text, 8, entry.permissions) || entry.permissions > 7) return std::nullopt;
  if (who == "g") {
    entry.kind = AclEntry::Kind::kOwningGroup;
    return entry;
  }
  if (who.empty() || !ReadNumber(who.substr(1), 10, entry.id)) return std::nullopt;
  if (who.front() == 'g') entry.kind = AclEntry::Kind::kGroup;
  return who.front() == 'g' || who.front() == 'u' ? std::optional(entry) : std::nullopt;
}

/// Users, the owning group once, groups.
std::optional<std::vector<AclEntry>> ParseAcl(std::string_view text) {
  std::vector<AclEntry> acl;
  bool owning_group = false;
  while (!text.empty()) {
    const std::optional<AclEntry> entry = ParseEntry(Cut(text, ','));
    if (!entry.has_value() || (entry->kind == AclEntry::Kind::kGroup) != owning_group) return std::nullopt;
    owning_group = entry->kind != AclEntry::Kind::kUser;
    acl.push_back(*entry);
  }
  return owning_group ? std::optional(std::move(acl)) : std::nullopt;
}

std::string AclText(const std::vector<AclEntry>& acl) {
  std::string text;
  for (const AclEntry& entry : acl) {
    if (!text.empty()) text += ',';
    text += entry.kind == AclEntry::Kind::kUser ? 'u' : 'g';
    if (entry.kind != AclEntry::Kind::kOwningGroup) text += std::to_string(entry.id);
    text += '=';
    text += static_cast<char>('0' + entry.permissions);
  }
  return text;
}

}  // namespace

std::optional<AccessRecord> ParseAccess(std::string_view text) {
  AccessRecord record;
  std::string_view rest = text;
  const bool numbers = ReadNumber(Cut(rest, ':'), 10, record.uid) && ReadNumber(Cut(rest, ':'), 10, record.gid) &&
                       ReadNumber(Cut(rest, ':'), 8, record.mode) && record.mode <= kModeMax;
  if (!numbers) return std::nullopt;
  if (!rest.empty()) {
    std::optional<std::vector<AclEntry>> acl = ParseAcl(rest);
    if (!acl.has_value()) return std::nullopt;
    record.acl = *std::move(acl);
  }
  // One record has one spelling: without leading zeros, and what else from_chars passes over.
  return AccessText(record) == text ? std::optional(std::move(record)) : std::nullopt;
}

std::string AccessText(const AccessRecord& record) {
  char mode[8];
  (void)snprintf(mode, sizeof(mode), "%04o", static_cast<unsigned>(record.mode));
  std::string text = std::to_string(record.uid) + ":" + std::to_string(record.gid) + ":" + mode;
  if (!record.acl.empty()) text += ":" + AclText(record.acl);
  return text;
}

void ReadAccessRecords(Database& database, int64_t first, int64_t last,
                       const std::function<void(const AccessRecord&)>& take) {
  Statement statement =
      database.Prepare("SELECT id, uid, gid, mode, acl FROM access WHERE id BETWEEN ?1 AND ?2 ORDER BY id");
  statement.Bind(1, first).Bind(2, last);
  while (statement.Step()) {
    AccessRecord record;
    record.number = statement.Int(0);
    record.uid = static_cast<uint32_t>(statement.Int(1));
    record.gid = static_cast<uint32_t>(statement.Int(2));
    record.mode = static_cast<uint16_t>(statement.Int(3));
    if (const std::string_view acl = statement.Text(4); !acl.empty()) {
      std::optional<std::vector<AclEntry>> entries = ParseAcl(acl);
      if (!entries.has_value()) database.Fail(SQLITE_CORRUPT);
      record.acl = *std::move(entries);
    }
    take(record);
  }
}

int64_t AccessRecords::NumberOf(const Json::Value& member) {
  if (member.isNull()) return kNone;
  return NumberOf(member.isString() ? member.asString() : std::string());
}

int64_t AccessRecords::NumberOf(const std::string& text) {
  const auto kept = numbers_.find(text);
  if (kept != numbers_.end()) return kept->second;
  const std::optional<AccessRecord> record = ParseAccess(text);
  if (!record.has_value()) {
    throw Error(Error::kEngineBadRequest, "\"" + std::string(field::kAccess) + "\" must be " + kAccessSpelling);
  }
  const std::string acl = AclText(record->acl);
  const auto bind = [&record, &acl](Statement statement) {
    statement.Bind(1, int64_t{record->uid}).Bind(2, int64_t{record->gid}).Bind(3, int64_t{record->mode});
    statement.Bind(4, std::string_view(acl));
    return statement;
  };
  Statement find =
      bind(database_.Prepare("SELECT id FROM access WHERE uid = ?1 AND gid = ?2 AND mode = ?3 AND acl = ?4"));
  int64_t number = find.Step() ? find.Int(0) : kNone;
  if (number == kNone) {
    bind(database_.Prepare("INSERT INTO access(uid, gid, mode, acl) VALUES(?1, ?2, ?3, ?4)")).Run();
    number = sqlite3_last_insert_rowid(database_.Handle());
  }
  Keep(text, number);
  return number;
}

std::string AccessRecords::TextOf(int64_t number) {
  const auto kept = texts_.find(number);
  if (kept != texts_.end()) return kept->second;
  std::string text;
  ReadAccessRecords(database_, number, number, [&text](const AccessRecord& record) { text = AccessText(record); });
  if (text.empty()) database_.Fail(SQLITE_CORRUPT);
  Keep(text, number);
  return text;
}

void AccessRecords::Keep(const std::string& text, int64_t number) {
  if (kept_bytes_ > kKeptMaxBytes) Forget();
  kept_bytes_ += 2 * text.size() + kEntryBytes;
  numbers_.emplace(text, number);
  texts_.emplace(number, text);
}

void AccessRecords::Forget() {
  numbers_.clear();
  texts_.clear();
  kept_bytes_ = 0;
}

}  // namespace ferrox::engine
