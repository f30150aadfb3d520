#include "services/kovaelasticd/store/older_format.h"

#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

bool PrepareOlderFormat(Database& database) {
  if (database.QueryInt("PRAGMA user_version") >= kTreeFormat) return false;
  database.Execute(
      "CREATE TEMP VIEW docs AS SELECT id, 1 AS folder, substr(path, 2) AS leaf, name, ext, kind, size, mtime,"
      " text_bytes, derived, error, packed, 0 AS access FROM main.docs");
  database.Execute("CREATE TEMP TABLE folders(id INTEGER PRIMARY KEY, parent INTEGER, name TEXT, access INTEGER)");
  database.Execute("INSERT INTO temp.folders VALUES(1, 0, '/', 0)");
  return true;
}

DocSet DocumentsAtWholePath(Database& database, const std::string& path) {
  Statement statement = database.Prepare("SELECT id FROM main.docs WHERE path = ?1 OR (path >= ?2 AND path < ?3)");
  const std::string below = path + "/";
  const std::string end = EndOfPrefix(below);
  statement.Bind(1, std::string_view(path)).Bind(2, std::string_view(below));
  BindEnd(statement, 3, end);
  DocSet found;
  while (statement.Step()) found.Add(statement.Int(0));
  return found;
}

}  // namespace ferrox::engine
