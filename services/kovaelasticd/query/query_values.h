#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovaelasticd/query/value_range.h"

namespace ferrox::engine {

// The values of conditions: sizes, dates, durations, users and groups. All of them read what stands behind "name:" and
// answer with nothing where they cannot; ConditionReader makes a sentence of that.

/// ">10M", "<=2k", "1k..2M", "1-5MB", "..5G", "700": bytes. One size with a unit, "5M", has room for what is rounded to
/// it. Nothing when the text is no size.
std::optional<ValueRange> ParseSizeRange(std::string_view text);

/// Fields that hold a number, and how a range of them is written.
struct RangeField {
  const char* name;  ///< "pages"
  std::vector<std::string> fields;
  std::optional<ValueRange> (*parse)(std::string_view text, int64_t now);
  const char* example;
};
const std::vector<RangeField>& RangeFields();
/// Null when the name stands for none.
const RangeField* FindRangeField(std::string_view name);

/// The number of a user or group of this host; nothing when there is none of that name. May ask a directory service.
std::optional<int64_t> UserNumberOf(const std::string& name);
std::optional<int64_t> GroupNumberOf(const std::string& name);

}  // namespace ferrox::engine
