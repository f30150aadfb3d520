#include "services/kovaelasticd/query/query_values.h"

#include <grp.h>
#include <pwd.h>

#include <algorithm>
#include <ctime>
#include <limits>
#include <utility>

#include "base/text.h"
#include "common/clock.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

namespace names = fileindex::elastic;

constexpr int64_t kMin = std::numeric_limits<int64_t>::min();
constexpr int64_t kMax = std::numeric_limits<int64_t>::max();
/// For the texts of an account's record; a group with many members needs much.
constexpr size_t kAccountBufferBytes = 64 << 10;

/// Reads the digits at the front and takes them off; nothing when there are none or too many.
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

/// "700", "10k", "2MB", "1GiB": powers of 1024 in any spelling.
std::optional<ValueRange> ParseSize(std::string_view text) {
  const std::optional<int64_t> number = TakeNumber(text, 15);
  if (!number.has_value()) return std::nullopt;
  constexpr std::string_view kUnits = "kmgt";
  int64_t factor = 1;
  if (!text.empty()) {
    const size_t unit = kUnits.find(static_cast<char>(text.front() | 0x20));
    if (unit == std::string_view::npos) return std::nullopt;
    factor <<= 10 * (unit + 1);
    text.remove_prefix(1);
  }
  const bool unit_ends_well = text.empty() || text == "b" || text == "B" || text == "iB" || text == "ib";
  if (!unit_ends_well || *number > kMax / factor) return std::nullopt;
  return ValueRange{*number * factor, *number * factor};
}

int64_t LocalTime(int64_t year, int64_t month, int64_t day) {
  tm parts = {};
  parts.tm_year = static_cast<int>(year - 1900);
  parts.tm_mon = static_cast<int>(month - 1);
  parts.tm_mday = static_cast<int>(day);
  parts.tm_isdst = -1;
  return int64_t{mktime(&parts)};
}

ValueRange DayOf(int64_t moment, int days_before) {
  const time_t seconds = static_cast<time_t>(moment);
  tm parts = {};
  (void)localtime_r(&seconds, &parts);
  const int64_t year = parts.tm_year + 1900;
  const int64_t month = parts.tm_mon + 1;
  const int64_t day = parts.tm_mday - days_before;
  return {LocalTime(year, month, day), LocalTime(year, month, day + 1) - 1};
}

/// "7d": from so long ago until now.
std::optional<ValueRange> ParseAge(std::string_view text, int64_t now) {
  const std::optional<int64_t> number = TakeNumber(text, 6);
  if (!number.has_value() || text.size() != 1) return std::nullopt;
  constexpr std::pair<char, int64_t> kUnits[] = {
      {'h', 3600}, {'d', kDaySec}, {'w', 7 * kDaySec}, {'m', 30 * kDaySec}, {'y', 365 * kDaySec}};
  for (const auto& [unit, seconds] : kUnits) {
    if (unit == text.front()) return ValueRange{now - *number * seconds, kMax};
  }
  return std::nullopt;
}

/// A date as it was written; 0: not given.
struct WrittenDate {
  int64_t year = 0;
  int64_t month = 0;
  int64_t day = 0;
};

/// "2024", "2024-03", "2024-03-15", "03/2024", "15.03.2024"; instead of "-" also "/" and ".". Of "3/4/2024", where
/// either may be the month, nothing.
std::optional<WrittenDate> ReadDate(std::string_view text) {
  int64_t parts[3] = {0, 0, 0};
  size_t count = 0;
  size_t year_at = 3;
  char separator = '\0';
  while (count < 3) {
    const size_t before = text.size();
    const std::optional<int64_t> number = TakeNumber(text, 4);
    if (!number.has_value()) return std::nullopt;
    if (before - text.size() == 4) year_at = std::min(year_at, count);
    parts[count++] = *number;
    if (text.empty()) break;
    if ((separator != '\0' && text.front() != separator) || std::string_view("-/.").find(text.front()) == text.npos) {
      return std::nullopt;
    }
    separator = text.front();
    text.remove_prefix(1);
  }
  if (!text.empty() || (year_at != 0 && year_at != count - 1)) return std::nullopt;
  if (year_at == 0) return WrittenDate{parts[0], count > 1 ? parts[1] : 0, parts[2]};
  if (count == 2) return WrittenDate{parts[1], parts[0], 0};
  if (separator != '/' || parts[0] > 12 || parts[0] == parts[1]) return WrittenDate{parts[2], parts[1], parts[0]};
  return parts[1] > 12 ? std::optional(WrittenDate{parts[2], parts[0], parts[1]}) : std::nullopt;
}

/// A year, a month of one, or a day: its first and last second.
std::optional<ValueRange> ParseCalendar(std::string_view text) {
  const size_t parts = 1 + static_cast<size_t>(std::count_if(text.begin(), text.end(),
                                                             [](char c) { return c == '-' || c == '/' || c == '.'; }));
  const std::optional<WrittenDate> date = ReadDate(text);
  if (!date.has_value() || date->year < 1900) return std::nullopt;
  const auto& [year, month, day] = *date;
  if (parts == 1) return ValueRange{LocalTime(year, 1, 1), LocalTime(year + 1, 1, 1) - 1};
  if (month < 1 || month > 12) return std::nullopt;
  if (parts == 2) return ValueRange{LocalTime(year, month, 1), LocalTime(year, month + 1, 1) - 1};
  if (day < 1 || day > 31) return std::nullopt;
  return ValueRange{LocalTime(year, month, day), LocalTime(year, month, day + 1) - 1};
}

/// Reads "a", "a..b", "a..", "..b", ">a", ">=a", "<a", "<=a", where `parse` reads one value with its own extent.
template <typename Parse>
std::optional<ValueRange> ParseRange(std::string_view text, Parse parse) {
  const size_t dots = text.find("..");
  if (dots != std::string_view::npos) {
    const std::string_view from = text.substr(0, dots);
    const std::string_view to = text.substr(dots + 2);
    const auto low = from.empty() ? ValueRange{kMin, kMin} : parse(from);
    const auto high = to.empty() ? ValueRange{kMax, kMax} : parse(to);
    if (!low.has_value() || !high.has_value() || (from.empty() && to.empty())) return std::nullopt;
    return ValueRange{low->low, high->high};
  }
  const char sign = text.empty() ? '\0' : text.front();
  if (sign != '<' && sign != '>') return parse(text);
  text.remove_prefix(1);
  const bool equal = !text.empty() && text.front() == '=';
  if (equal) text.remove_prefix(1);
  const auto value = parse(text);
  if (!value.has_value()) return std::nullopt;
  if (sign == '>') return ValueRange{equal ? value->low : value->high + 1, kMax};
  return ValueRange{kMin, equal ? value->high : value->low - 1};
}

/// A whole number.
std::optional<ValueRange> ParseNumber(std::string_view text) {
  const std::optional<int64_t> number = TakeNumber(text, 15);
  return number.has_value() && text.empty() ? std::optional(ValueRange{*number, *number}) : std::nullopt;
}

/// "90", "5m", "1h30m", "3:25", "1:02:03": a range of seconds as long as the last unit: "5m" is 300 to 359.
std::optional<ValueRange> ParseDuration(std::string_view text) {
  const bool clock = text.find(':') != std::string_view::npos;
  if (text.empty() || text.back() == ':') return std::nullopt;
  int64_t seconds = 0;
  int64_t last_unit = 1;
  while (!text.empty()) {
    const std::optional<int64_t> number = TakeNumber(text, 6);
    if (!number.has_value()) return std::nullopt;
    const char unit = text.empty() ? (clock ? ':' : 's') : text.front();
    if (!text.empty()) text.remove_prefix(1);
    if (clock ? unit != ':' : unit != 's' && unit != 'm' && unit != 'h') return std::nullopt;
    last_unit = unit == 'h' ? 3600 : unit == 'm' ? 60 : 1;
    seconds = clock ? seconds * 60 + *number : seconds + *number * last_unit;
  }
  return ValueRange{seconds, seconds + last_unit - 1};
}

std::optional<ValueRange> ParseExactDuration(std::string_view text) {
  const std::optional<ValueRange> range = ParseDuration(text);
  return range.has_value() ? std::optional(ValueRange{range->low, range->low}) : std::nullopt;
}

std::optional<ValueRange> ParseNumberRange(std::string_view text, int64_t /*now*/) {
  return ParseRange(text, &ParseNumber);
}

/// "5m" alone is all from 5 to 6 minutes, ">5m" and "5m..7m" begin with the first second of it.
std::optional<ValueRange> ParseDurationRange(std::string_view text, int64_t /*now*/) {
  const std::optional<ValueRange> alone = ParseDuration(text);
  return alone.has_value() ? alone : ParseRange(text, &ParseExactDuration);
}

const std::vector<RangeField> kRangeFields = {
    {"duration",
     {names::kKOVAMDDurationSecond},
     &ParseDurationRange,
     "duration:>10m, duration:3m..4m30s or duration:3:25"},
    {"year", {names::kKOVAMDRecordingYear}, &ParseNumberRange, "year:1969 or year:1960..1969"},
    {"taken",
     {names::kKOVAMDContentCreationDate},
     &ParseDateRange,
     "taken:2024, taken:2024-01..2024-06 or taken:>2024-01-31"},
    {"created", {names::kKOVAMDContentCreationDate}, &ParseDateRange, "created:2024 or created:2024-01..2024-06"},
    {"pages", {names::kKOVAMDNumberOfPages}, &ParseNumberRange, "pages:>100 or pages:2..10"},
    {"width", {names::kKOVAMDPixelWidth}, &ParseNumberRange, "width:>=4000 or width:640..1024"},
    {"height", {names::kKOVAMDPixelHeight}, &ParseNumberRange, "height:>=3000 or height:480..768"},
    {"iso", {names::kKOVAMDISOSpeed}, &ParseNumberRange, "iso:>=1600 or iso:100..400"},
    {"track", {names::kKOVAMDAudioTrackNumber}, &ParseNumberRange, "track:1 or track:1..3"},
};

}  // namespace

const std::vector<RangeField>& RangeFields() { return kRangeFields; }

const RangeField* FindRangeField(std::string_view name) {
  const std::string lower = base::LowerAscii(std::string(name));
  for (const RangeField& known : kRangeFields) {
    if (lower == known.name) return &known;
  }
  return nullptr;
}

std::optional<ValueRange> ParseSizeRange(std::string_view text) { return ParseRange(text, &ParseSize); }

std::optional<ValueRange> ParseDateRange(std::string_view text, int64_t now) {
  const std::string lower = base::LowerAscii(std::string(text));
  if (lower == "today") return DayOf(now, 0);
  if (lower == "yesterday") return DayOf(now, 1);
  if (const auto age = ParseAge(lower, now)) return age;
  return ParseRange(text, &ParseCalendar);
}

std::optional<int64_t> UserNumberOf(const std::string& name) {
  std::vector<char> buffer(kAccountBufferBytes);
  passwd record = {};
  passwd* found = nullptr;
  (void)getpwnam_r(name.c_str(), &record, buffer.data(), buffer.size(), &found);
  return found == nullptr ? std::nullopt : std::optional<int64_t>(found->pw_uid);
}

std::optional<int64_t> GroupNumberOf(const std::string& name) {
  std::vector<char> buffer(kAccountBufferBytes);
  group record = {};
  group* found = nullptr;
  (void)getgrnam_r(name.c_str(), &record, buffer.data(), buffer.size(), &found);
  return found == nullptr ? std::nullopt : std::optional<int64_t>(found->gr_gid);
}

}  // namespace ferrox::engine
