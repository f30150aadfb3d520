#include "services/kovaelasticd/store/row_watch.h"

#include <string_view>

namespace ferrox::engine {

RowWatch::RowWatch(Database& database, Listener listener) : database_(database), listener_(std::move(listener)) {
  (void)sqlite3_update_hook(database_.Handle(), &RowWatch::OnRow, this);
}

RowWatch::~RowWatch() { (void)sqlite3_update_hook(database_.Handle(), nullptr, nullptr); }

void RowWatch::OnRow(void* self, int operation, const char* /*database*/, const char* table, sqlite3_int64 number) {
  constexpr struct {
    std::string_view name;
    Table table;
  } kTables[] = {{"docs", Table::kDocuments}, {"folders", Table::kFolders}, {"suspects", Table::kSuspects}};
  for (const auto& watched : kTables) {
    if (watched.name != table) continue;
    static_cast<const RowWatch*>(self)->listener_(watched.table, number, operation == SQLITE_UPDATE);
    return;
  }
}

}  // namespace ferrox::engine
