#pragma once

#include <cstdint>
#include <functional>

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Tells which rows of some tables a connection changes, by SQLite's own account: whoever changes a row cannot forget
/// to tell. SQLite leaves out two ways of deleting, which these tables must not know: "INSERT OR REPLACE", and "DELETE"
/// without a condition.
class RowWatch {
 public:
  enum class Table { kDocuments, kFolders, kSuspects };
  /// Called with each row as it is inserted, updated or deleted, while the statement runs: it must neither use the
  /// connection nor throw. `is_update`: the row was there before, and is there after.
  using Listener = std::function<void(Table table, int64_t number, bool is_update)>;

  /// `database` must outlive this, and is watched by nobody else.
  RowWatch(Database& database, Listener listener);
  RowWatch(const RowWatch&) = delete;
  RowWatch& operator=(const RowWatch&) = delete;
  ~RowWatch();

 private:
  static void OnRow(void* self, int operation, const char* database, const char* table, sqlite3_int64 number);

  Database& database_;
  const Listener listener_;
};

}  // namespace ferrox::engine
