#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "services/kovaelasticd/query/value_range.h"

namespace ferrox::engine {

/// "2024", "2024-01..2024-06", ">2024-01-01", "15.03.2024", "march 2024", "7d", "last 2 weeks", "today", "last month":
/// seconds since the epoch, by local time. `now` is in the same measure. Nothing when the text is no date.
std::optional<ValueRange> ParseDateRange(std::string_view text, int64_t now);

}  // namespace ferrox::engine
