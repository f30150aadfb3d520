#include "base/name_rules.h"

#include <locale.h>  // NOLINT(modernize-deprecated-headers): newlocale
#include <wctype.h>  // NOLINT(modernize-deprecated-headers): towlower_l

#include <algorithm>

#include "base/text.h"

namespace base {

namespace {

constexpr char kCaseCounts = '=';

/// The character that `text` begins with, or a byte that is none.
std::string_view FirstCharacter(std::string_view text) {
  return text.substr(0, std::max<size_t>(1, CharacterBytes(text)));
}

uint32_t CodePointOf(std::string_view character) {
  constexpr unsigned char kFirstBits[] = {0x7F, 0x1F, 0x0F, 0x07};
  uint32_t code_point = static_cast<unsigned char>(character[0]) & kFirstBits[character.size() - 1];
  for (const char c : character.substr(1)) code_point = code_point << 6 | (c & 0x3F);
  return code_point;
}

/// By way of the capital: letters that have one in common are the same.
uint32_t WithoutCase(uint32_t code_point) {
  static const locale_t locale = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
  if (locale == nullptr) return code_point;
  return towlower_l(towupper_l(code_point, locale), locale);
}

std::string WithoutCase(std::string_view name) {
  std::string folded;
  folded.reserve(name.size());
  while (!name.empty()) {
    const std::string_view character = FirstCharacter(name);
    if (CharacterBytes(character) <= 1) {
      folded += LowerAscii(character[0]);
    } else {
      AppendUtf8(folded, WithoutCase(CodePointOf(character)));
    }
    name.remove_prefix(character.size());
  }
  return folded;
}

/// Only the last "*" is ever gone back to: what an earlier one took more or less would be found by that one, too.
bool MatchesWild(std::string_view pattern, std::string_view name) {
  bool has_star = false;
  std::string_view behind_star, from_star;  // the pattern behind the last "*", and what is left of the name for both
  while (!name.empty()) {
    if (pattern.starts_with('*')) {
      has_star = true;
      pattern.remove_prefix(1);
      behind_star = pattern;
      from_star = name;
    } else if (pattern.starts_with('?')) {
      pattern.remove_prefix(1);
      name.remove_prefix(FirstCharacter(name).size());
    } else if (pattern.starts_with(name.front())) {
      pattern.remove_prefix(1);
      name.remove_prefix(1);
    } else {
      if (!has_star) return false;
      from_star.remove_prefix(FirstCharacter(from_star).size());
      pattern = behind_star;
      name = from_star;
    }
  }
  return pattern.find_first_not_of('*') == std::string_view::npos;
}

}  // namespace

std::string NameRules::TextOf(const std::vector<std::string>& patterns, bool case_counts) {
  const std::set<std::string> sorted(patterns.begin(), patterns.end());
  std::string text;
  if (case_counts && !sorted.empty()) text += kCaseCounts;
  for (const std::string& pattern : sorted) text += "/" + pattern;
  return text;
}

NameRules::NameRules(std::string_view text) : case_counts_(text.starts_with(kCaseCounts)) {
  if (case_counts_) text.remove_prefix(1);
  while (!text.empty()) {
    text.remove_prefix(1);
    const std::string_view pattern = text.substr(0, text.find('/'));
    text.remove_prefix(pattern.size());
    std::string made = case_counts_ ? std::string(pattern) : WithoutCase(pattern);
    if (made.find_first_of("*?") == std::string::npos) {
      whole_.insert(std::move(made));
    } else {
      wild_.push_back(std::move(made));
    }
  }
}

bool NameRules::Match(std::string_view name) const {
  if (IsEmpty()) return false;
  std::string folded;
  if (!case_counts_) name = folded = WithoutCase(name);
  return whole_.contains(name) ||
         std::any_of(wild_.begin(), wild_.end(), [name](const std::string& wild) { return MatchesWild(wild, name); });
}

bool NameRules::MatchAnyIn(std::string_view path) const {
  while (!path.empty()) {
    const size_t end = std::min(path.find('/'), path.size());
    if (end > 0 && Match(path.substr(0, end))) return true;
    path.remove_prefix(std::min(end + 1, path.size()));
  }
  return false;
}

}  // namespace base
