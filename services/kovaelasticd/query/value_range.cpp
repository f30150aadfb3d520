#include "services/kovaelasticd/query/value_range.h"

namespace ferrox::engine {

namespace {

constexpr std::string_view kBetween[] = {" - ", " to ", " until ", " till ", " bis "};

}  // namespace

std::optional<int64_t> TakeNumber(std::string_view& text, size_t digits_max) {
  size_t digits = 0;
  int64_t value = 0;
  while (digits < text.size() && text[digits] >= '0' && text[digits] <= '9') {
    if (++digits > digits_max) return std::nullopt;
    value = value * 10 + (text[digits - 1] - '0');
  }
  if (digits == 0) return std::nullopt;
  text.remove_prefix(digits);
  return value;
}

std::string_view WithoutBlanks(std::string_view text) {
  while (text.starts_with(' ')) text.remove_prefix(1);
  while (text.ends_with(' ')) text.remove_suffix(1);
  return text;
}

std::string WithDots(std::string_view text, bool bare) {
  const auto joined = [&text](size_t at, size_t bytes) {
    return std::string(text.substr(0, at)) + ".." + std::string(text.substr(at + bytes));
  };
  for (const std::string_view between : kBetween) {
    const size_t at = text.find(between);
    const bool is_between = at != text.npos && at > 0 && at + between.size() < text.size();
    if (is_between) return joined(at, between.size());
  }
  const size_t dash = bare ? text.find('-') : text.npos;
  return dash != text.npos && dash > 0 && dash + 1 < text.size() ? joined(dash, 1) : std::string(text);
}

}  // namespace ferrox::engine
