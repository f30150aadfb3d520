#pragma once

#include <string>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

// Searches in a file of an older format, which goes on until its upgrade is complete (upgrade.h). A connection to such
// a file gets temporary views, which SQLite finds before the file's tables of the same names: all that reads documents
// sees today's tables.

/// Gives the connection these views, where its file needs them. @return whether documents have whole paths there
/// (FolderTree::IsFlat). @throws Error kEngineStorage, IndexDamaged.
bool PrepareOlderFormat(Database& database);

/// In such a file: the document at `path`, and all below it.
DocSet DocumentsAtWholePath(Database& database, const std::string& path);

}  // namespace ferrox::engine
