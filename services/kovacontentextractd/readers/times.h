#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace ferrox::extract {

/// A time as a calendar and a clock show it, in the Gregorian calendar, also before that was introduced.
struct CivilTime {
  int64_t year = 0;
  int month = 1, day = 1, hour = 0, minute = 0, second = 0;
};

/// Seconds since 1970 of a time in UTC; nothing when there is no such time.
std::optional<int64_t> ToSeconds(const CivilTime& time);
/// The time in UTC of so many seconds since 1970, also before it.
CivilTime FromSeconds(int64_t seconds);

/// Seconds since 1970 of a time as Windows counts it, in 100 ns since 1601; nothing before 1970.
std::optional<int64_t> FromFileTime(uint64_t ticks);

/// Reads "2024-03-01T10:11:12.5+02:00" and what is shorter, down to the year; the date's parts may stand between ":" as
/// well, as cameras write them, and a blank for the "T". Without a zone, as UTC.
std::optional<int64_t> ParseTime(std::string_view text);

}  // namespace ferrox::extract
