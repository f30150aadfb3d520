#include "services/kovaelasticd/query/query_dates.h"

#include <algorithm>
#include <ctime>
#include <string>
#include <utility>
#include <vector>

#include "common/clock.h"
#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

constexpr int64_t kYearMin = 1900;
constexpr int64_t kYearMax = 9999;

int64_t LocalTime(int64_t year, int64_t month, int64_t day) {
  tm parts = {};
  parts.tm_year = static_cast<int>(year - 1900);
  parts.tm_mon = static_cast<int>(month - 1);
  parts.tm_mday = static_cast<int>(day);
  parts.tm_isdst = -1;
  return int64_t{mktime(&parts)};
}

tm LocalParts(int64_t moment) {
  const time_t seconds = static_cast<time_t>(moment);
  tm parts = {};
  (void)localtime_r(&seconds, &parts);
  return parts;
}

ValueRange Days(int64_t year, int64_t month, int64_t day, int64_t days) {
  return {LocalTime(year, month, day), LocalTime(year, month, day + days) - 1};
}

/// The `unit` of time that `now` is in, or the one `before` it by so many.
std::optional<ValueRange> PeriodBefore(std::string_view unit, int64_t now, int before) {
  const tm parts = LocalParts(now);
  const int64_t year = parts.tm_year + 1900;
  const int64_t month = parts.tm_mon + 1;
  if (unit == "day") return Days(year, month, parts.tm_mday - before, 1);
  if (unit == "week") return Days(year, month, parts.tm_mday - (parts.tm_wday + 6) % 7 - 7 * before, 7);
  if (unit == "month")
    return ValueRange{LocalTime(year, month - before, 1), LocalTime(year, month - before + 1, 1) - 1};
  if (unit == "year") return ValueRange{LocalTime(year - before, 1, 1), LocalTime(year - before + 1, 1, 1) - 1};
  return std::nullopt;
}

/// "today", "yesterday", "this week", "last month".
std::optional<ValueRange> ParsePeriod(std::string_view text, int64_t now) {
  if (text == "today") return PeriodBefore("day", now, 0);
  if (text == "yesterday") return PeriodBefore("day", now, 1);
  const size_t blank = text.find(' ');
  if (blank == text.npos) return std::nullopt;
  const std::string_view which = text.substr(0, blank);
  const std::string_view unit = WithoutBlanks(text.substr(blank));
  if (which == "this") return PeriodBefore(unit, now, 0);
  return which == "last" || which == "past" ? PeriodBefore(unit, now, 1) : std::nullopt;
}

/// "7d", "7 days", "last 2 weeks": from so long ago until now.
std::optional<ValueRange> ParseAge(std::string_view text, int64_t now) {
  for (const std::string_view before : {"last ", "past "}) {
    if (text.starts_with(before)) text = WithoutBlanks(text.substr(before.size()));
  }
  const std::optional<int64_t> number = TakeNumber(text, 6);
  text = WithoutBlanks(text);
  if (!number.has_value() || text.empty()) return std::nullopt;
  constexpr std::pair<std::string_view, int64_t> kUnits[] = {
      {"hours", 3600}, {"days", kDaySec}, {"weeks", 7 * kDaySec}, {"months", 30 * kDaySec}, {"years", 365 * kDaySec}};
  for (const auto& [unit, seconds] : kUnits) {
    const bool is_unit = text == unit || text == unit.substr(0, unit.size() - 1) || text == unit.substr(0, 1);
    if (is_unit) return ValueRange{now - *number * seconds, ValueRange::kMax};
  }
  return std::nullopt;
}

/// A date as it was written; 0: not given.
struct WrittenDate {
  int64_t year = 0;
  int64_t month = 0;
  int64_t day = 0;
};

/// "2024", "2024-03", "2024-03-15", "03/2024", "15.03.2024", "15.3.24"; instead of "-" also "/" and ".". Of "3/4/2024",
/// where either may be the month, nothing.
std::optional<WrittenDate> ReadNumericDate(std::string_view text) {
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
  if (text.empty() && count == 3 && year_at == 3 && separator == '.')
    return WrittenDate{2000 + parts[2], parts[1], parts[0]};
  if (!text.empty() || (year_at != 0 && year_at != count - 1)) return std::nullopt;
  if (year_at == 0) return WrittenDate{parts[0], parts[1], parts[2]};
  if (count == 2) return WrittenDate{parts[1], parts[0], 0};
  if (separator != '/' || parts[0] > 12 || parts[0] == parts[1]) return WrittenDate{parts[2], parts[1], parts[0]};
  return parts[1] > 12 ? std::optional(WrittenDate{parts[2], parts[0], parts[1]}) : std::nullopt;
}

/// 1 to 12 for the name of a month, folded, or three letters of it or more; 0 for anything else.
int64_t MonthNamed(std::string_view word) {
  constexpr std::string_view kMonths[][4] = {{"january", "januar", "janner"},
                                             {"february", "februar"},
                                             {"march", "marz", "maerz", "mrz"},
                                             {"april"},
                                             {"may", "mai"},
                                             {"june", "juni"},
                                             {"july", "juli"},
                                             {"august"},
                                             {"september"},
                                             {"october", "oktober"},
                                             {"november"},
                                             {"december", "dezember"}};
  if (word.size() < 3) return 0;
  int64_t number = 0;
  for (const auto& names : kMonths) {
    ++number;
    for (const std::string_view name : names) {
      if (name.starts_with(word)) return number;
    }
  }
  return 0;
}

/// "march 2024", "15 March 2024", "Mar 15, 2024", "15. März 2024", "15-mar-2024", "march": the latest one.
std::optional<WrittenDate> ReadNamedDate(const std::string& text, int64_t now) {
  WrittenDate date;
  for (size_t begin = 0; begin < text.size();) {
    const size_t end = std::min(text.size(), text.find_first_of(" ,.-/", begin));
    std::string_view word = std::string_view(text).substr(begin, end - begin);
    begin = end + 1;
    if (word.empty() || word == "of") continue;
    const size_t bytes = word.size();
    const int64_t month = MonthNamed(word);
    const std::optional<int64_t> number = TakeNumber(word, 4);
    const bool is_day = number.has_value() && bytes <= 4 &&
                        (word.empty() ? bytes <= 2 : word == "st" || word == "nd" || word == "rd" || word == "th");
    int64_t* const part = month != 0 ? &date.month : is_day ? &date.day : &date.year;
    if (*part != 0 || (month == 0 && !is_day && (!word.empty() || bytes != 4))) return std::nullopt;
    *part = month != 0 ? month : *number;
  }
  if (date.month == 0) return std::nullopt;
  if (date.year == 0) {
    const tm parts = LocalParts(now);
    date.year = parts.tm_year + 1900 - (date.month > parts.tm_mon + 1 ? 1 : 0);
  }
  return date;
}

std::optional<WrittenDate> ReadDate(const std::string& text, int64_t now) {
  const bool digits = text.find_first_not_of("0123456789") == text.npos;
  if (digits && text.size() == 8) {
    return ReadNumericDate(text.substr(0, 4) + "-" + text.substr(4, 2) + "-" + text.substr(6));
  }
  const size_t time = text.size() > 10 && text[4] == '-' ? text.find('t', 10) : text.npos;  // 2024-03-15T10:30
  if (time == 10) return ReadNumericDate(text.substr(0, time));
  const std::optional<WrittenDate> date = ReadNumericDate(text);
  return date.has_value() ? date : ReadNamedDate(text, now);
}

/// A year, a month of one, or a day: its first and last second.
std::optional<ValueRange> ParseCalendar(std::string_view text, int64_t now) {
  if (const auto period = ParsePeriod(text, now)) return period;
  const std::optional<WrittenDate> date = ReadDate(std::string(text), now);
  if (!date.has_value() || date->year < kYearMin || date->year > kYearMax) return std::nullopt;
  const auto& [year, month, day] = *date;
  if (month == 0 && day == 0) return ValueRange{LocalTime(year, 1, 1), LocalTime(year + 1, 1, 1) - 1};
  if (month < 1 || month > 12 || day < 0 || day > 31) return std::nullopt;
  if (day == 0) return ValueRange{LocalTime(year, month, 1), LocalTime(year, month + 1, 1) - 1};
  return Days(year, month, day, 1);
}

/// "2023-2024", which is no month.
bool IsTwoYears(std::string_view text) {
  const auto is_year = [](std::string_view part) {
    return part.size() == 4 && part.find_first_not_of("0123456789") == part.npos;
  };
  return text.size() == 9 && text[4] == '-' && is_year(text.substr(0, 4)) && is_year(text.substr(5));
}

}  // namespace

std::optional<ValueRange> ParseDateRange(std::string_view text, int64_t now) {
  const std::string folded = FoldText(WithoutBlanks(text));
  if (const auto age = ParseAge(folded, now)) return age;
  return ParseRange(WithDots(folded, IsTwoYears(folded)),
                    [now](std::string_view date) { return ParseCalendar(date, now); });
}

}  // namespace ferrox::engine
