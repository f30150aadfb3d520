#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <unordered_map>

#include <json/value.h>

#include "base/access_record.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Reads the records with the numbers from `first` to `last`, in their order. @throws Error kEngineStorage.
void ReadAccessRecords(Database& database, int64_t first, int64_t last,
                       const std::function<void(int64_t number, const base::AccessRecord&)>& take);

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
