#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

constexpr int64_t kDaySeconds = 86400;

/// Days since 1970 of a date in the Gregorian calendar, counted in eras of 400 years (146097 days) that begin on 1
/// March: so the leap day is the last of its year, and month lengths repeat every 5 months with 153 days. 719468 days
/// lie between 1 March of the year 0 and 1970.
int64_t DaysOf(int64_t year, int month, int day) {
  year -= month <= 2 ? 1 : 0;
  const int64_t era = (year >= 0 ? year : year - 399) / 400;
  const int64_t year_of_era = year - era * 400;
  const int64_t day_of_year = (153 * (month + (month > 2 ? -3 : 9)) + 2) / 5 + day - 1;
  const int64_t day_of_era = year_of_era * 365 + year_of_era / 4 - year_of_era / 100 + day_of_year;
  return era * 146097 + day_of_era - 719468;
}

/// Reads a number of at most `digits` digits off the text; nothing when there is none.
std::optional<int> TakeNumber(std::string_view& text, size_t digits) {
  int value = 0;
  size_t length = 0;
  for (; length < digits && length < text.size() && text[length] >= '0' && text[length] <= '9'; ++length) {
    value = value * 10 + (text[length] - '0');
  }
  text.remove_prefix(length);
  return length > 0 ? std::optional<int>(value) : std::nullopt;
}

/// Takes one character off the text when it is one of these.
bool Take(std::string_view& text, std::string_view any_of) {
  if (text.empty() || any_of.find(text.front()) == std::string_view::npos) return false;
  text.remove_prefix(1);
  return true;
}

/// Seconds that the zone at the beginning of `text` is ahead of UTC.
int64_t ZoneSeconds(std::string_view text) {
  while (Take(text, " ")) continue;
  const bool west = !text.empty() && text.front() == '-';
  if (!Take(text, "+-")) return 0;
  const int hours = TakeNumber(text, 2).value_or(0);
  (void)Take(text, ":");
  const int seconds = hours * 3600 + TakeNumber(text, 2).value_or(0) * 60;
  return west ? -seconds : seconds;
}

}  // namespace

std::optional<int64_t> ToSeconds(const CivilTime& time) {
  const bool valid = time.year >= 1 && time.year <= 9999 && time.month >= 1 && time.month <= 12 && time.day >= 1 &&
                     time.day <= 31 && time.hour >= 0 && time.hour <= 24 && time.minute >= 0 && time.minute <= 59 &&
                     time.second >= 0 && time.second <= 60;
  if (!valid) return std::nullopt;
  return DaysOf(time.year, time.month, time.day) * kDaySeconds + time.hour * 3600 + time.minute * 60 + time.second;
}

CivilTime FromSeconds(int64_t seconds) {
  const int64_t day_second = ((seconds % kDaySeconds) + kDaySeconds) % kDaySeconds;
  const int64_t days = (seconds - day_second) / kDaySeconds + 719468;
  const int64_t era = (days >= 0 ? days : days - 146096) / 146097;
  const int64_t day_of_era = days - era * 146097;
  const int64_t year_of_era = (day_of_era - day_of_era / 1460 + day_of_era / 36524 - day_of_era / 146096) / 365;
  const int64_t day_of_year = day_of_era - (365 * year_of_era + year_of_era / 4 - year_of_era / 100);
  const int64_t month_from_march = (5 * day_of_year + 2) / 153;
  CivilTime time;
  time.day = static_cast<int>(day_of_year - (153 * month_from_march + 2) / 5 + 1);
  time.month = static_cast<int>(month_from_march < 10 ? month_from_march + 3 : month_from_march - 9);
  time.year = year_of_era + era * 400 + (time.month <= 2 ? 1 : 0);
  time.hour = static_cast<int>(day_second / 3600);
  time.minute = static_cast<int>(day_second / 60 % 60);
  time.second = static_cast<int>(day_second % 60);
  return time;
}

std::optional<int64_t> ParseTime(std::string_view text) {
  while (Take(text, " \t\r\n")) continue;
  CivilTime time;
  const std::optional<int> year = TakeNumber(text, 4);
  if (!year.has_value()) return std::nullopt;
  time.year = *year;
  if (Take(text, "-:/")) time.month = TakeNumber(text, 2).value_or(0);
  if (Take(text, "-:/")) time.day = TakeNumber(text, 2).value_or(0);
  if (!Take(text, "T t")) return ToSeconds(time);
  const std::optional<int> hour = TakeNumber(text, 2);
  if (!hour.has_value()) return ToSeconds(time);
  time.hour = *hour;
  if (Take(text, ":")) time.minute = TakeNumber(text, 2).value_or(0);
  if (Take(text, ":")) time.second = TakeNumber(text, 2).value_or(0);
  if (Take(text, ".,")) (void)TakeNumber(text, 9);
  const std::optional<int64_t> seconds = ToSeconds(time);
  return seconds.has_value() ? std::optional<int64_t>(*seconds - ZoneSeconds(text)) : std::nullopt;
}

std::optional<int64_t> FromFileTime(uint64_t ticks) {
  constexpr int64_t kTicksPerSecond = 10000000, kSecondsTo1970 = 11644473600;
  const auto seconds = static_cast<int64_t>(ticks & INT64_MAX) / kTicksPerSecond - kSecondsTo1970;
  return seconds > 0 ? std::optional<int64_t>(seconds) : std::nullopt;
}

}  // namespace ferrox::extract
