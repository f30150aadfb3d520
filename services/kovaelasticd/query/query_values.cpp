#include "services/kovaelasticd/query/query_values.h"

#include <grp.h>
#include <pwd.h>

#include "base/text.h"
#include "services/kovaelasticd/query/query_dates.h"
#include "wire/fields.h"

namespace ferrox::engine {

namespace {

namespace names = fileindex::elastic;

constexpr int64_t kMax = ValueRange::kMax;
/// For the texts of an account's record; a group with many members needs much.
constexpr size_t kAccountBufferBytes = 64 << 10;

/// "700", "10k", "2MB", "1.5 GiB": powers of 1024 in any spelling.
struct WrittenSize {
  int64_t bytes = 0;
  int64_t last_digit = 0;  ///< the bytes that one more in its last digit makes
};

std::optional<WrittenSize> ReadSize(std::string_view text) {
  const std::optional<int64_t> number = TakeNumber(text, 15);
  if (!number.has_value()) return std::nullopt;
  int64_t fraction = 0, parts = 1;
  if (text.starts_with('.')) {
    text.remove_prefix(1);
    const size_t before = text.size();
    const std::optional<int64_t> digits = TakeNumber(text, 3);
    if (!digits.has_value()) return std::nullopt;
    fraction = *digits;
    for (size_t i = text.size(); i < before; ++i) parts *= 10;
  }
  text = WithoutBlanks(text);
  constexpr std::string_view kUnits = "kmgt";
  const size_t unit = text.empty() ? kUnits.npos : kUnits.find(static_cast<char>(text.front() | 0x20));
  int64_t factor = 1;
  if (unit != kUnits.npos) {
    factor <<= 10 * (unit + 1);
    text.remove_prefix(1);
  }
  const std::string end = base::LowerAscii(std::string(text));
  const bool unit_ends_well =
      end.empty() || end == "b" || end == "ib" || (factor == 1 && (end == "byte" || end == "bytes"));
  if (!unit_ends_well || *number >= kMax / factor || (factor == 1 && parts > 1)) return std::nullopt;
  return WrittenSize{*number * factor + fraction * factor / parts, factor / parts};
}

std::optional<ValueRange> ParseSize(std::string_view text) {
  const std::optional<WrittenSize> size = ReadSize(text);
  return size.has_value() ? std::optional(ValueRange{size->bytes, size->bytes}) : std::nullopt;
}

/// Of "1..5M" the unit is that of both.
std::string WithUnits(std::string range) {
  const size_t dots = range.find("..");
  if (dots == range.npos || dots == 0 || range.find_first_not_of("0123456789. ") == range.npos) return range;
  const bool lacks_unit = range.find_first_not_of("0123456789. ") > dots;
  const size_t unit = range.find_first_not_of("0123456789. ", dots);
  return lacks_unit && unit != range.npos ? range.insert(dots, range.substr(unit)) : range;
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
    text = WithoutBlanks(text);
    const char unit = text.empty() ? (clock ? ':' : 's') : text.front();
    if (!text.empty()) text.remove_prefix(1);
    if (unit == 'm' && text.starts_with("in")) text.remove_prefix(2);
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
  return ParseRange(WithDots(text, true), &ParseNumber);
}

/// "5m" alone is all from 5 to 6 minutes, ">5m" and "5m..7m" begin with the first second of it.
std::optional<ValueRange> ParseDurationRange(std::string_view text, int64_t /*now*/) {
  const std::optional<ValueRange> alone = ParseDuration(text);
  return alone.has_value() ? alone : ParseRange(WithDots(text, true), &ParseExactDuration);
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

std::optional<ValueRange> ParseSizeRange(std::string_view text) {
  const std::optional<WrittenSize> alone = ReadSize(text);
  if (!alone.has_value()) return ParseRange(WithUnits(WithDots(text, true)), &ParseSize);
  const int64_t half = alone->last_digit / 2;
  return ValueRange{alone->bytes - half, alone->bytes + (half == 0 ? 0 : half - 1)};
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
