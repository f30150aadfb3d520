#pragma once

#include <cstdint>
#include <string>

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

// The formats of index files, as PRAGMA user_version has them. Files from kOldestFormat on are upgraded (upgrade.h).
inline constexpr int64_t kOldestFormat = 2;
inline constexpr int64_t kTreeFormat = 3;  ///< the first whose documents lie in a tree of folders
inline constexpr int64_t kStoreFormat = 4;
/// Since this format texts are cut into words as they are now, so that an upgrade can take the words over.
inline constexpr int64_t kWordsFormat = 4;

// All throw Error kEngineStorage when the file is no index or has a format that this engine does not know; it is left
// as it is then, with its log. IndexDamaged when it is damaged.

/// Whether the file has an older format.
bool NeedsUpgrade(const std::string& path);

/// SQLite moves the write-ahead log into the file when a commit has made it longer than so many pages.
inline constexpr int kLogPages = 1000;

/// Makes a connection that writes ready: its settings, the tokenizer and, with `create` in a file without tables, the
/// tables. Blocks while another connection writes, at most Database::kBusyTimeoutMs. A file of an older format is
/// refused, too.
void PrepareStore(Database& database, bool create);

/// What a new file is made of, within a transaction of the caller's. An upgrade fills the tables before their indexes
/// are made.
void MakeStoreTables(Database& database);
void MakeStoreIndexes(Database& database);

}  // namespace ferrox::engine
