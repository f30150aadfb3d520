#include "services/kovaelasticd/text/pattern.h"

#include <algorithm>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

constexpr char kWildcards[] = "*?";
constexpr size_t kLettersMin = 2;
constexpr size_t kDigitsMin = 4;
constexpr size_t kPartCharacters = 3;

bool IsPatternDigit(char c) { return c >= '0' && c <= '9'; }
bool IsPatternLetter(char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c & 0x80) != 0; }
bool IsWordByte(char c) { return IsPatternLetter(c) || IsPatternDigit(c); }
/// What patterns of names have beside words.
bool IsNameByte(char c) {
  return IsWordByte(c) || std::string_view("*?._-+#&,~'@%$!()[]").find(c) != std::string_view::npos;
}

/// What may stand beside a wildcard: of "f(*p)" it is none.
bool MayJoin(char c) { return IsWordByte(c) || std::string_view("*?._-").find(c) != std::string_view::npos; }

/// Whether a word begins or ends at `at`, or there is none.
bool IsEdge(std::string_view text, size_t at) {
  return at == 0 || at == text.size() || !IsWordByte(text[at - 1]) || !IsWordByte(text[at]);
}

size_t NextCharacter(std::string_view text, size_t at) {
  ++at;
  while (at < text.size() && (text[at] & 0xC0) == 0x80) ++at;
  return at;
}

}  // namespace

bool IsPattern(std::string_view word) {
  const size_t end = word.find_last_not_of("*?");
  if (end == std::string_view::npos || word.size() > Pattern::kMostBytes || word.find("**") != word.npos) return false;
  if (!std::all_of(word.begin(), word.end(), &IsNameByte)) return false;
  const size_t at = word.find_first_of(kWildcards);
  if (at > end) return false;
  const auto letters = static_cast<size_t>(std::count_if(word.begin(), word.end(), &IsPatternLetter));
  const auto digits = static_cast<size_t>(std::count_if(word.begin(), word.end(), &IsPatternDigit));
  if (letters + digits < (letters == 0 ? kDigitsMin : kLettersMin)) return false;
  return (at == 0 || MayJoin(word[at - 1])) && MayJoin(word[at + 1]);
}

Pattern::Pattern(std::string_view pattern) : folded_(FoldText(pattern)) {}

bool Pattern::MatchesName(std::string_view folded_name) const { return Matches(folded_name, false); }
bool Pattern::MatchesWord(std::string_view folded_word) const { return Matches(folded_word, true); }

/// A "*" takes as little as it can, and one character more each time that what follows does not match: only the last
/// one need be remembered. In a part of a name, one that stops at the edges of words comes first.
bool Pattern::Matches(std::string_view text, bool whole) const {
  const std::string_view pattern = folded_;
  constexpr size_t kNone = std::string_view::npos;
  size_t at = 0, next = 0;
  size_t star = kNone;  // what follows the last "*", in the pattern
  size_t taken = 0;     // how far that has come, in the text
  bool by_edges = !whole;
  if (by_edges) star = 0;
  for (;;) {
    if (next == pattern.size()) {
      if (at == text.size() || (!whole && IsEdge(text, at)) || pattern.ends_with('*')) return true;
    } else if (pattern[next] == '*') {
      star = ++next;
      taken = at;
      by_edges = false;
      continue;
    } else if (at < text.size() && (pattern[next] == '?' || pattern[next] == text[at])) {
      at = pattern[next] == '?' ? NextCharacter(text, at) : at + 1;
      ++next;
      continue;
    }
    if (star == kNone || taken >= text.size()) return false;
    do {
      taken = NextCharacter(text, taken);
    } while (by_edges && taken < text.size() && !IsEdge(text, taken));
    at = taken;
    next = star;
  }
}

bool Pattern::IsOfLetters() const {
  return std::all_of(folded_.begin(), folded_.end(), [](char c) { return c == '*' || c == '?' || IsPatternLetter(c); });
}

std::string_view Pattern::Beginning() const {
  return std::string_view(folded_).substr(0, std::min(folded_.size(), folded_.find_first_of(kWildcards)));
}

std::vector<std::string> Pattern::Parts() const {
  std::vector<std::string> parts;
  for (size_t begin = 0; begin < folded_.size();) {
    const size_t end = std::min(folded_.size(), folded_.find_first_of(kWildcards, begin));
    size_t characters = 0;
    for (size_t at = begin; at < end; at = NextCharacter(folded_, at)) ++characters;
    if (characters >= kPartCharacters) parts.push_back(folded_.substr(begin, end - begin));
    begin = end + 1;
  }
  return parts;
}

}  // namespace ferrox::engine
