#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Where a word stands in a document's text.
struct WordPosition {
  uint32_t document;
  uint32_t position;  ///< counted in words from 0
  uint8_t term;       ///< whatever the caller numbers
};

/// Where to put the positions of one word, and of which documents.
struct PositionRequest {
  const DocSet& wanted;
  size_t most;   ///< the first so many of a document, for each phrase of the expression
  uint8_t term;  ///< of all that is added
  std::vector<WordPosition>& found;
};

/// Makes the function that CollectPositions needs known to a connection.
void RegisterPositions(Database& database, fts5_api* api);

/// Adds the positions at which the phrases of a full-text expression stand, phrase by phrase and document by document.
/// Costs a walk over all documents that have them, some 0.1 us each. The expression must not look for the beginnings of
/// words. @throws Error kEngineStorage.
void CollectPositions(Database& database, const char* table, const std::string& expression, PositionRequest request);

}  // namespace ferrox::engine
