#pragma once

#include <string>
#include <vector>

#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// Other spellings for the words of a query that found nothing, from the table "suggestions": at most three, the most
/// similar first for each word.
std::vector<std::string> Suggest(Database& database, const std::vector<std::string>& words);

/// The same for an asker, by the words of the full-text tables that two documents or more have which they may read; of
/// equally similar ones those in the most of these. Where that is too much work, nothing is suggested: how far it came
/// would tell of the words of others. `database` has the tables of a StoreReader.
std::vector<std::string> SuggestVisible(Database& database, const std::vector<std::string>& words,
                                        const Visible& visible);

/// Fills the table "suggestions" anew from the words of the full-text tables, within the transaction that is open.
/// Walks the whole vocabulary of the index.
void RebuildSuggestions(Database& database);

}  // namespace ferrox::engine
