#pragma once

#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/text/schema.h"

namespace ferrox::engine {

/// The format of an index file that this engine reads and writes, as PRAGMA user_version has it. Files of format 2 are
/// brought to it when they are opened.
inline constexpr int64_t kStoreFormat = 3;

/// Makes a connection that writes ready: its settings, the tokenizer and, with `create` in a file without tables, the
/// tables. A file of format 2 has its list of documents rewritten in one transaction; a kill meanwhile leaves it as
/// it was. Blocks while another connection writes, at most Database::kBusyTimeoutMs. `schema` is the
/// index's.
/// @throws Error kEngineStorage when the file is no index or has another format, which is then left as it is;
/// IndexDamaged.
void PrepareStore(Database& database, bool create, const Schema& schema);

}  // namespace ferrox::engine
