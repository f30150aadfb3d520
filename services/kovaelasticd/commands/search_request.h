#pragma once

#include <cstdint>

#include <json/value.h>

#include "services/kovaelasticd/store/index_store.h"

namespace ferrox::engine {

/// Hits in one reply.
inline constexpr int64_t kHitsMax = 1000;
/// The last hit that can be reached by paging: all before it have to be ordered for it.
inline constexpr int64_t kLastHitMax = 100000;

/// The members of a search but the query and what is searched. The default order is the best, newest or largest first,
/// and names from A to Z. @throws Error kEngineBadRequest.
SearchRequest ReadSearch(const Json::Value& data);

}  // namespace ferrox::engine
