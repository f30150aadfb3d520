#pragma once

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// The one format of an index file that this engine reads and writes, as PRAGMA user_version has it.
inline constexpr int64_t kStoreFormat = 2;

/// Makes a connection that writes ready: its settings, the tokenizer and, with `create` in a file without tables, the
/// tables. Blocks while another connection writes, at most Database::kBusyTimeoutMs.
/// @throws Error kEngineStorage when the file is no index or has another format; IndexDamaged.
void PrepareStore(Database& database, bool create);

}  // namespace ferrox::engine
