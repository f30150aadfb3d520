#pragma once

#include <string>
#include <vector>

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// Other spellings for the words of a query that found nothing, from the table "suggestions": at most three, the most
/// similar first for each word.
std::vector<std::string> Suggest(Database& database, const std::vector<std::string>& words);

/// Fills the table "suggestions" anew from the words of the full-text tables, within the transaction that is open.
/// Walks the whole vocabulary of the index.
void RebuildSuggestions(Database& database);

}  // namespace ferrox::engine
