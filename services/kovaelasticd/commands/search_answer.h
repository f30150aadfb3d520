#pragma once

#include <string>
#include <vector>

#include <json/value.h>

#include "services/kovaelasticd/commands/merged_search.h"

namespace ferrox::engine {

/// Sets the members of the reply to a search that tell how its words were taken: "total", "total_all", "ignored",
/// "repaired", "none_has_all", "suggestions", and "hints": those about the query, and those about what was found. Who
/// asks makes no difference: all of them follow from the documents that were searched for the asker.
void AddTotalsAndWords(Json::Value& result, const MergedReply& found, const std::vector<std::string>& query_hints);

/// Sets "asked": the fields that the query has conditions on, by the names that people give them. Absent: none.
void AddFieldsAskedFor(Json::Value& result, const QueryNode& query);

/// The members of a hit that are the same for everyone: "doc_id", "score", "snippet", "title", "explain".
Json::Value HitForAll(const SearchHit& found);

}  // namespace ferrox::engine
