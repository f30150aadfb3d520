#include "services/kovaelasticd/text/spellings.h"

#include <cstddef>
#include <cstdint>
#include <utility>

#include "services/kovaelasticd/text/fold.h"

namespace ferrox::engine {

namespace {

constexpr size_t kSpellingsMax = 3;
/// Shorter words have too many neighbours: "does" is not "dos".
constexpr size_t kUmlautWordMin = 5;
constexpr std::string_view kArabicArticle = "\xD8\xA7\xD9\x84";
constexpr std::string_view kHebrewArticle = "\xD7\x94";

bool IsLetterOf(char c, std::string_view set) { return set.find(c) != set.npos; }

/// Whether a consonant stands at `pos`: before others "ue" is rarely an umlaut ("neue").
bool IsConsonant(std::string_view word, size_t pos) {
  return pos < word.size() && word[pos] >= 'b' && word[pos] <= 'z' && !IsLetterOf(word[pos], "eiouy");
}

/// The word with each "ae", "oe" and "ue" as the letter that its umlaut is folded to, and "aa" as "a".
std::string WithoutDigraphs(std::string_view word) {
  std::string out;
  for (size_t pos = 0; pos < word.size(); ++pos) {
    out += word[pos];
    if (pos + 1 >= word.size() || !IsConsonant(word, pos + 2)) continue;
    const bool umlaut = IsLetterOf(word[pos], "aou") && word[pos + 1] == 'e';
    const bool after_vowel = pos > 0 && IsLetterOf(word[pos - 1], "aeoq");
    if ((umlaut && !after_vowel) || word.substr(pos, 2) == "aa") ++pos;
  }
  return out;
}

/// The word with one "a", "o" or "u" written as an umlaut is where there are none, each in its turn.
void AddDigraphs(std::vector<std::string>& words, std::string_view word) {
  for (size_t pos = 0; pos < word.size() && words.size() < kSpellingsMax; ++pos) {
    const bool alone = pos == 0 || !IsLetterOf(word[pos - 1], "aeiouq");
    if (!IsLetterOf(word[pos], "aou") || !alone || !IsConsonant(word, pos + 1)) continue;
    words.push_back(std::string(word.substr(0, pos + 1)) + "e" + std::string(word.substr(pos + 1)));
  }
}

size_t CountCharacters(std::string_view text) {
  size_t count = 0;
  for (size_t pos = 0; pos < text.size(); pos += DecodeAt(text, pos).length_bytes) ++count;
  return count;
}

/// The word without the article at its beginning, or with one.
std::string OtherArticle(std::string_view word, std::string_view article) {
  if (word.substr(0, article.size()) != article) return std::string(article) + std::string(word);
  word.remove_prefix(article.size());
  return CountCharacters(word) < 3 ? std::string() : std::string(word);
}

}  // namespace

std::vector<std::string> OtherSpellings(std::string_view folded_word) {
  std::vector<std::string> words;
  if (folded_word.empty()) return words;
  const uint32_t first = DecodeAt(folded_word, 0).value;
  const bool arabic = first >= 0x0620 && first <= 0x06FF;
  const bool hebrew = first >= 0x05D0 && first <= 0x05EA;
  if (arabic || hebrew) {
    if (CountCharacters(folded_word) < 3) return words;
    std::string other = OtherArticle(folded_word, arabic ? kArabicArticle : kHebrewArticle);
    if (!other.empty()) words.push_back(std::move(other));
    return words;
  }
  if (folded_word.size() < kUmlautWordMin || folded_word.find_first_of("0123456789") != folded_word.npos) return words;
  std::string plain = WithoutDigraphs(folded_word);
  if (plain != folded_word) words.push_back(std::move(plain));
  AddDigraphs(words, folded_word);
  return words;
}

}  // namespace ferrox::engine
