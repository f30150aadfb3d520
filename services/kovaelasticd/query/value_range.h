#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <string_view>

namespace ferrox::engine {

/// A range of numbers, both ends included.
struct ValueRange {
  static constexpr int64_t kMin = std::numeric_limits<int64_t>::min();
  static constexpr int64_t kMax = std::numeric_limits<int64_t>::max();
  int64_t low;
  int64_t high;
};

/// Reads the digits at the front and takes them off; nothing when there are none or too many.
std::optional<int64_t> TakeNumber(std::string_view& text, size_t digits_max);

std::string_view WithoutBlanks(std::string_view text);

/// "1 to 5", "1 - 5", "1 bis 5" as "1..5"; with `bare` "1-5", too. Any other text as it is.
std::string WithDots(std::string_view text, bool bare);

/// Reads "a", "a..b", "a..", "..b", ">a", ">=a", "<a", "<=a", where `parse` reads one value with its own extent.
template <typename Parse>
std::optional<ValueRange> ParseRange(std::string_view text, Parse parse) {
  constexpr int64_t kMin = ValueRange::kMin, kMax = ValueRange::kMax;
  const size_t dots = text.find("..");
  if (dots != std::string_view::npos) {
    const std::string_view from = WithoutBlanks(text.substr(0, dots));
    const std::string_view to = WithoutBlanks(text.substr(dots + 2));
    const auto low = from.empty() ? ValueRange{kMin, kMin} : parse(from);
    const auto high = to.empty() ? ValueRange{kMax, kMax} : parse(to);
    if (!low.has_value() || !high.has_value() || (from.empty() && to.empty())) return std::nullopt;
    return ValueRange{low->low, high->high};
  }
  const char sign = text.empty() ? '\0' : text.front();
  if (sign != '<' && sign != '>') return parse(text);
  text.remove_prefix(1);
  const bool equal = text.starts_with('=');
  if (equal) text.remove_prefix(1);
  const auto value = parse(WithoutBlanks(text));
  if (!value.has_value()) return std::nullopt;
  if (sign == '>') return ValueRange{equal ? value->low : value->high + 1, kMax};
  return ValueRange{kMin, equal ? value->high : value->low - 1};
}

}  // namespace ferrox::engine
