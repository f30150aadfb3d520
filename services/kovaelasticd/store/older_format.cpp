#include "services/kovaelasticd/store/older_format.h"

#include "services/kovaelasticd/store/store_format.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

bool PrepareOlderFormat(Database& database) {
  const int64_t format = database.QueryInt("PRAGMA user_version");
  if (format >= kStoreFormat) return false;
  const bool is_flat = format < kTreeFormat;
  const bool has_access = database.QueryInt("SELECT count(*) FROM main.sqlite_master WHERE name = 'access'") != 0;
  database.Execute("CREATE TEMP VIEW docs AS SELECT id, " +
                   std::string(is_flat ? "1 AS folder, substr(path, 2) AS leaf" : "folder, leaf") +
                   ", name, ext, kind, size, mtime, text_bytes, derived, error, packed, " +
                   (has_access ? "access" : "0 AS access") + ", 0 AS language, '' AS title FROM main.docs");
  if (is_flat) {
    database.Execute("CREATE TEMP TABLE folders(id INTEGER PRIMARY KEY, parent INTEGER, name TEXT, access INTEGER)");
    database.Execute("INSERT INTO temp.folders VALUES(1, 0, '/', 0)");
  } else if (!has_access) {
    database.Execute("CREATE TEMP VIEW folders AS SELECT id, parent, name, 0 AS access FROM main.folders");
  }
  return is_flat;
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
