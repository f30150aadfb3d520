#include "services/kovacontentextractd/readers/cell_numbers.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>

#include "services/kovacontentextractd/readers/times.h"

namespace ferrox::extract {

namespace {

/// A date, a time or both; empty for what no calendar of Excel has. Day 25569 is 1970-01-01; days that are counted from
/// 1904 begin 1462 days later, and 2958466 is the first day of the year 10000.
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

/// With as many digits as Excel keeps.
std::string GeneralText(double value) {
  std::array<char, 64> text;
  const auto written = std::to_chars(text.data(), text.data() + text.size(), value, std::chars_format::general, 15);
  return {text.data(), written.ptr};
}

/// With a fixed number of digits behind the point.
std::string FixedText(double value, const NumberFormat& format) {
  constexpr double kMax = 1e15;
  if (format.percent) value *= 100;
  if (!(std::fabs(value) < kMax)) return {};
  std::array<char, 64> buffer;
  const auto written =
      std::to_chars(buffer.data(), buffer.data() + buffer.size(), value, std::chars_format::fixed, format.decimals);
  std::string text(buffer.data(), written.ptr);
  const size_t digits_at = text[0] == '-' ? 1 : 0;
  size_t at = std::min(text.find('.'), text.size());
  while (format.grouped && at > digits_at + 3) text.insert(at -= 3, 1, ',');
  return format.percent ? text + "%" : text;
}

/// Calls `take` with each character of the format that is no text to be shown, condition, colour or fill.
template <typename Take>
void ForEachSign(std::string_view code, Take take) {
  bool quoted = false, bracketed = false;
  for (size_t i = 0; i < code.size(); ++i) {
    const char c = code[i];
    if (c == '"') quoted = !quoted;
    if (c == '\\' || c == '_' || c == '*') ++i;
    if (c == '[' || c == ']') bracketed = c == '[';
    if (!quoted && !bracketed) take(c);
  }
}

bool IsOneOf(char c, std::string_view signs) { return signs.find(c) != std::string_view::npos; }

}  // namespace

/// A format is a text such as "#,##0.00" or "dd/mm/yyyy;@": up to four parts, for positive numbers, negative ones, zero
/// and texts, of which the first is followed. Whatever has letters of a date counts as one. Fractions, exponents, and
/// numbers shown in thousands are shown as they are.
NumberFormat ParseNumberFormat(std::string_view code) {
  constexpr int kDecimalsMax = 15;
  NumberFormat format;
  bool in_first = true, has_digits = false, behind_point = false, followed = true;
  char before = '\0';
  ForEachSign(code, [&](char c) {
    if (IsOneOf(c, "yYdDhHsS")) format.kind = NumberFormat::kDate;
    if (c == ';') in_first = false;  // what follows is for other values: negative ones, zero
    if (!in_first) return;
    if (c == '0' || c == '#') {
      has_digits = true;
      if (behind_point) ++format.decimals;
      if (before == ',') format.grouped = true;
    }
    if (c == '.') behind_point = true;
    if (c == '%') format.percent = true;
    if (IsOneOf(c, "eE/?@gG") || (behind_point && (c == '#' || c == ','))) followed = false;
    before = c;
  });
  const bool scaled = before == ',';
  if (format.kind != NumberFormat::kDate && has_digits && followed && !scaled && format.decimals <= kDecimalsMax) {
    format.kind = NumberFormat::kFixed;
  }
  return format;
}

NumberFormat BuiltInNumberFormat(int id) {
  const auto is_in = [id](int first, int last) { return id >= first && id <= last; };
  // The numbers are fixed by the file format, some of them for dates of East Asian calendars.
  if (is_in(14, 22) || is_in(27, 36) || is_in(45, 47) || is_in(50, 58)) return {NumberFormat::kDate};
  static constexpr const char* kCodes[] = {"General", "0",        "0.00",     "#,##0", "#,##0.00", "#,##0",
                                           "#,##0",   "#,##0.00", "#,##0.00", "0%",    "0.00%"};
  if (is_in(0, 10)) return ParseNumberFormat(kCodes[id]);
  if (is_in(37, 44)) return ParseNumberFormat((id - 37) % 4 < 2 ? "#,##0" : "#,##0.00");  // sums, with signs around
  return {};
}

std::string NumberText(double value, const NumberFormat& format, bool from_1904) {
  std::string text = format.kind == NumberFormat::kDate ? DateText(value, from_1904) : std::string();
  if (!text.empty()) return text;
  text = GeneralText(value);  // also of what no calendar has
  const std::string shown = format.kind == NumberFormat::kFixed ? FixedText(value, format) : std::string();
  return shown.empty() || shown == text ? text : text + " " + shown;
}

}  // namespace ferrox::extract
