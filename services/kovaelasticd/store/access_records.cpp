#include "services/kovaelasticd/store/access_records.h"

#include "base/access_record.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

namespace {

/// What an entry of the cache takes beside its text, about.
constexpr size_t kEntryBytes = 160;

}  // namespace

void ReadAccessRecords(Database& database, int64_t first, int64_t last,
                       const std::function<void(int64_t number, const base::AccessRecord&)>& take) {
  Statement statement =
      database.Prepare("SELECT id, uid, gid, mode, acl FROM access WHERE id BETWEEN ?1 AND ?2 ORDER BY id");
  statement.Bind(1, first).Bind(2, last);
  while (statement.Step()) {
    base::AccessRecord record;
    record.uid = static_cast<uint32_t>(statement.Int(1));
    record.gid = static_cast<uint32_t>(statement.Int(2));
    record.mode = static_cast<uint16_t>(statement.Int(3));
    if (const std::string_view acl = statement.Text(4); !acl.empty()) {
      std::optional<std::vector<base::AclEntry>> entries = base::ParseAcl(acl);
      if (!entries.has_value()) database.Fail(SQLITE_CORRUPT);
      record.acl = *std::move(entries);
    }
    take(statement.Int(0), record);
  }
}

int64_t AccessRecords::NumberOf(const Json::Value& member) {
  if (member.isNull()) return kNone;
  return NumberOf(member.isString() ? member.asString() : std::string());
}

int64_t AccessRecords::NumberOf(const std::string& text) {
  const auto kept = numbers_.find(text);
  if (kept != numbers_.end()) return kept->second;
  const std::optional<base::AccessRecord> record = base::ParseAccess(text);
  if (!record.has_value()) {
    throw Error(Error::kEngineBadRequest, "\"" + std::string(field::kAccess) + "\" must be " + base::kAccessSpelling);
  }
  const std::string acl = base::AclText(record->acl);
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
  ReadAccessRecords(database_, number, number,
                    [&text](int64_t, const base::AccessRecord& record) { text = base::AccessText(record); });
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
