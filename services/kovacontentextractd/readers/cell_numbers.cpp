#include "services/kovacontentextractd/readers/cell_numbers.h"

#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>

#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

std::string DateText(double days, bool from_1904) {
  constexpr double kEpochDays = 25569, kDays1904 = 1462, kDaysMax = 2958466;
  const double since_1900 = days + (from_1904 ? kDays1904 : 0);
  if (!(since_1900 >= 0 && since_1900 < kDaysMax)) return {};
  const CivilTime time = FromSeconds(std::llround((since_1900 - kEpochDays) * 86400));
  std::array<char, 64> text;
  const bool has_time = days != std::floor(days), has_date = days >= 1;
  int size = 0;
  if (has_date) {
    size = snprintf(text.data(), text.size(), "%04d-%02d-%02d%s", static_cast<int>(time.year), time.month, time.day,
                    has_time ? " " : "");
  }
  if (has_time) {
    size += snprintf(text.data() + size, text.size() - static_cast<size_t>(size), "%02d:%02d", time.hour, time.minute);
  }
  return {text.data(), static_cast<size_t>(size)};
}

}  // namespace

bool IsDateFormat(std::string_view format) {
  bool quoted = false, bracketed = false;
  for (size_t i = 0; i < format.size(); ++i) {
    const char c = format[i];
    if (c == '"') quoted = !quoted;
    if (c == '\\' || c == '_' || c == '*') ++i;
    if (c == '[' || c == ']') bracketed = c == '[';
    if (!quoted && !bracketed && std::string_view("yYdDhHsS").find(c) != std::string_view::npos) return true;
  }
  return false;
}

bool IsBuiltInDateFormat(int id) { return (id >= 14 && id <= 22) || (id >= 27 && id <= 36) || (id >= 45 && id <= 58); }

std::string NumberText(double value, bool is_date, bool from_1904) {
  if (is_date) return DateText(value, from_1904);
  std::array<char, 64> text;
  const auto written = std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::general, 15);
  return {text.data(), written.ptr};
}

}  // namespace ferrox::extract
