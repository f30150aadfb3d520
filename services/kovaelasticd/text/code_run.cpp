#include "services/kovaelasticd/text/code_run.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <utility>

#include "services/kovaelasticd/text/code_bytes.h"

namespace ferrox::engine {

namespace {

// A joined code has letters and digits enough to be one, and at most as many as an account number (IBAN).
constexpr size_t kJoinedMin = 5;
constexpr size_t kWideMin = 7;
constexpr size_t kJoinedMax = 34;
constexpr size_t kPrefixMax = 4;
/// As many digits may be behind the comma of a number.
constexpr size_t kDecimalsMax = 4;
/// An address of a network card; fewer groups with ":" are a time of day.
constexpr size_t kColonGroupsMin = 4;

/// A run of letters and digits.
struct Group {
  size_t begin;
  size_t end;
  uint8_t mask;    ///< of CodeByte
  size_t letters;  ///< how many of them
  size_t Size() const { return end - begin; }
  bool HasDigit() const { return (mask & kDigitByte) != 0; }
  bool IsDigits() const { return mask == kDigitByte; }
};

/// The group at `pos`; of no size where none begins.
Group ReadGroup(std::string_view text, size_t pos) {
  Group group{pos, pos, 0, 0};
  while (group.end < text.size()) {
    const uint8_t byte = CodeByte(text[group.end]);
    if (byte == 0 || byte == kWideCodeByte) break;
    group.mask |= byte;
    group.letters += byte == kDigitByte ? 0 : 1;
    ++group.end;
  }
  return group;
}

bool IsDigitAt(std::string_view text, size_t pos) { return pos < text.size() && CodeByte(text[pos]) == kDigitByte; }

bool IsTightSign(char c) { return c == '-' || c == '.' || c == '/' || c == '_' || c == ',' || c == ':'; }

void AppendFolded(std::string& joined, std::string_view text) {
  for (const char c : text) joined += c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

/// The groups of a tight run: as many as a code can have, and one more.
class TightGroups {
 public:
  TightGroups(std::string_view text, size_t pos) : text_(text) {
    Group group = ReadGroup(text, pos);
    if (group.letters > std::max(kPrefixMax, group.Size() / 2)) return;
    size_t bytes = 0;
    while (group.Size() > 0 && size_ < groups_.size()) {
      groups_[size_++] = group;
      bytes += group.Size();
      if (bytes > kJoinedMax || group.end + 1 >= text.size() || !IsTightSign(text[group.end])) return;
      group = ReadGroup(text, group.end + 1);
      if (group.letters > group.Size() / 2) return;
    }
  }
  size_t Size() const { return size_; }
  const Group& operator[](size_t i) const { return groups_[i]; }
  char SignBefore(size_t i) const { return text_[groups_[i].begin - 1]; }
  void Cut(size_t size) { size_ = size; }

 private:
  std::string_view text_;
  std::array<Group, kJoinedMax + 1> groups_;
  size_t size_ = 0;
};

/// Whether the commas are those of a number: before the decimals, or before each three digits.
bool AreCommasOfNumber(std::string_view text, const TightGroups& groups) {
  if (groups[0].begin > 1 && text[groups[0].begin - 1] == ',' && IsDigitAt(text, groups[0].begin - 2)) return false;
  size_t commas = 0;
  bool thousands = true;
  for (size_t i = 0; i < groups.Size(); ++i) {
    if (!groups[i].IsDigits()) return false;
    if (i == 0) continue;
    const char sign = groups.SignBefore(i);
    if (sign != ',' && sign != '.') return false;
    if (sign != ',') continue;
    ++commas;
    thousands = thousands && groups[i].Size() == 3;
  }
  const size_t last = groups.Size() - 1;
  const bool decimals = commas == 1 && groups.SignBefore(last) == ',' && groups[last].Size() <= kDecimalsMax;
  return (thousands && groups[0].Size() <= 3) || decimals;
}

/// Ends the groups before a comma that separates values, and before a colon that is no code's.
void CutAtForeignSigns(std::string_view text, TightGroups& groups) {
  for (size_t i = 1; i < groups.Size(); ++i) {
    const char sign = groups.SignBefore(i);
    if ((sign == ':' && groups.Size() < kColonGroupsMin) || (sign == ',' && !AreCommasOfNumber(text, groups))) {
      return groups.Cut(i);
    }
  }
}

/// Whether the number is one of a row of numbers, as in a table.
bool HasNumberBeside(std::string_view text, size_t begin, size_t end) {
  while (begin > 0 && (text[begin - 1] == ' ' || text[begin - 1] == '-')) --begin;
  while (end < text.size() && (text[end] == ' ' || text[end] == '-')) ++end;
  return (begin > 0 && IsDigitAt(text, begin - 1)) || IsDigitAt(text, end);
}

/// Two groups of digits that are joined in no way of writing them: "0.25", "3.14159" and "12,50", but not "1234.50" and
/// "34.567", which may have another sign, or none, before each three digits.
bool IsPlainNumber(std::string_view text, const TightGroups& groups) {
  if (groups.Size() != 2 || !groups[0].IsDigits() || !groups[1].IsDigits()) return false;
  const char sign = groups.SignBefore(1);
  if (sign != '.' && sign != ',') return false;
  if (groups[1].Size() == 2) return groups[0].Size() < 4;
  if (groups[1].Size() != 3 || groups[0].Size() > 3) return true;
  return HasNumberBeside(text, groups[0].begin, groups[1].end);
}

/// How many bytes are the blank between two parts; 0 when there is none.
size_t BlankBytes(std::string_view text, size_t pos) {
  for (const std::string_view blank : {" / ", ") ", " (", " ", ")", "\xC2\xA0", "\xE2\x80\xAF"}) {
    if (text.substr(pos, blank.size()) == blank) return blank.size();
  }
  return 0;
}

/// Whether the part was cut: a time of day, or values in a row.
bool GoesOn(std::string_view text, size_t end) {
  return end + 1 < text.size() && (text[end] == ':' || text[end] == ',') && CodeByte(text[end + 1]) != 0;
}

uint8_t MaskOf(std::string_view part) {
  uint8_t mask = 0;
  for (const char c : part) mask |= CodeByte(c);
  return mask;
}

/// Tells which parts between blanks are one code. Letters are in the first one alone, but in an account number, which
/// has four characters in each part.
class WideParts {
 public:
  explicit WideParts(bool any_case) : any_case_(any_case) {}

  /// Whether `part` goes on with the code, or with what cannot be one as a whole.
  bool Take(std::string_view part) {
    const uint8_t mask = MaskOf(part);
    if (first_.empty()) {
      first_ = part;
      const uint8_t country = MaskOf(part.substr(0, 2));
      account_ = part.size() == 4 && (country == kCapitalByte || (any_case_ && country == kSmallByte)) &&
                 MaskOf(part.substr(2)) == kDigitByte;
      return (mask & kDigitByte) != 0 || (part.size() >= 2 && (any_case_ || mask == kCapitalByte));
    }
    const bool four = std::exchange(ended_, part.size() != 4) == false && part.size() <= 4;
    account_ = account_ && four;
    if (!account_ && mask != kDigitByte) return false;
    const bool valued = part.find_first_of(".,") != part.npos;
    if (MaskOf(first_) == kCapitalByte || MaskOf(first_) == kSmallByte) {
      code_ = code_ && (more_ || (part.size() >= 3 && !valued));
    }
    // A value with a point is the last part: others are numbers in a row.
    code_ = code_ && (account_ || part.size() >= 2) && !valued_ && first_.find_first_of(".,") == first_.npos;
    valued_ = valued;
    more_ = true;
    return true;
  }
  bool AreCode() const { return code_; }

 private:
  bool any_case_;
  std::string_view first_;
  bool account_ = false;
  bool ended_ = false;  ///< a part has other than four characters
  bool valued_ = false;
  bool more_ = false;  ///< there is a second part
  bool code_ = true;
};

}  // namespace

CodeRun ReadTightRun(std::string_view text, size_t pos) {
  TightGroups groups(text, pos);
  CodeRun run;
  run.end = pos;
  if (groups.Size() == 0) return run;
  CutAtForeignSigns(text, groups);
  run.parts = groups.Size();
  run.end = groups[groups.Size() - 1].end;
  if (groups.Size() < 2 || IsPlainNumber(text, groups)) return run;
  for (size_t i = 0; i < groups.Size(); ++i) {
    AppendFolded(run.joined, text.substr(groups[i].begin, groups[i].Size()));
  }
  if (run.joined.size() < kJoinedMin || run.joined.size() > kJoinedMax) run.joined.clear();
  return run;
}

CodeRun ReadWideRun(std::string_view text, size_t pos, bool any_case) {
  CodeRun wide;
  wide.end = pos;
  WideParts parts(any_case);
  for (size_t next = pos;;) {
    const size_t end = ReadTightRun(text, next).end;
    const std::string_view part = text.substr(next, end - next);
    if (part.empty() || GoesOn(text, end) || !parts.Take(part)) break;
    if (wide.joined.size() <= kJoinedMax) {
      for (const char c : part) {
        if (CodeByte(c) != 0) AppendFolded(wide.joined, {&c, 1});
      }
    }
    ++wide.parts;
    wide.end = end;
    const size_t blank = BlankBytes(text, end);
    if (blank == 0) break;
    next = end + blank;
  }
  const bool code = wide.parts > 1 && wide.joined.size() >= kWideMin && wide.joined.size() <= kJoinedMax;
  if (!code || !parts.AreCode()) wide.joined.clear();
  return wide;
}

}  // namespace ferrox::engine
