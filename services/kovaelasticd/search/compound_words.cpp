#include "services/kovaelasticd/search/compound_words.h"

#include <algorithm>
#include <iterator>
#include <utility>

#include "services/kovaelasticd/text/stems.h"

namespace ferrox::engine {

namespace {

/// More are a sign that a word is a common ending, and would take too long to look for.
constexpr size_t kCompoundsMax = 100;
constexpr size_t kPartLeastBytes = 4;
/// What joins two words, and the endings of a word's other forms.
constexpr std::string_view kLinks[] = {"", "s", "n", "e", "en", "er", "es", "ns", "a"};
constexpr std::string_view kEndings[] = {"en", "er", "es", "n", "e", "s", "a", "ar", "or", "et", "t"};

bool IsCompounding(Language language) {
  switch (language) {
    case Language::kGerman:
    case Language::kDutch:
    case Language::kSwedish:
    case Language::kDanish:
    case Language::kNorwegian:
    case Language::kFinnish:
      return true;
    default:
      return false;
  }
}

bool IsEnding(std::string_view rest) {
  return rest.empty() || std::find(std::begin(kEndings), std::end(kEndings), rest) != std::end(kEndings);
}

/// The word, and without each ending.
std::vector<std::string_view> BeginningsOf(std::string_view word) {
  std::vector<std::string_view> beginnings = {word};
  for (const std::string_view ending : kEndings) {
    if (!word.ends_with(ending) || word.size() < kPartLeastBytes + ending.size()) continue;
    beginnings.push_back(word.substr(0, word.size() - ending.size()));
  }
  return beginnings;
}

/// Adds the words of the list that a part of a compound may be: itself, or a form of it.
void AddWords(const WordList& words, std::string_view part, std::vector<std::string>& found) {
  if (part.size() < kPartLeastBytes) return;
  std::string word(part);
  if (words.Has(word)) found.push_back(word);
  for (const std::string_view ending : kEndings) {
    word.replace(part.size(), word.npos, ending);
    if (words.Has(word)) found.push_back(word);
  }
}

/// What is left of a compound behind its first word, or before its last one, is another word and what joins them.
std::vector<std::string> OtherWords(const WordList& words, std::string_view rest, bool is_behind) {
  std::vector<std::string> found;
  for (const std::string_view link : kLinks) {
    if (!(is_behind ? rest.starts_with(link) : rest.ends_with(link))) continue;
    AddWords(words, rest.substr(is_behind ? link.size() : 0, rest.size() - link.size()), found);
  }
  return found;
}

}  // namespace

std::vector<Compound> CompoundsIn(const WordList& words, std::string_view word) {
  std::vector<Compound> found;
  if (!WordList::Takes(word)) return found;
  const auto add = [&](std::string_view compound, std::string_view rest, bool is_behind) {
    if (found.size() > kCompoundsMax) return;
    std::vector<std::string> others = OtherWords(words, rest, is_behind);
    if (!others.empty()) found.push_back({std::string(compound), std::move(others)});
  };
  for (const std::string_view begin : BeginningsOf(word)) {
    words.ForEachBeginning(begin, [&](std::string_view longer, bool) {
      if (longer.size() < begin.size() + kPartLeastBytes) return;
      add(longer, longer.substr(begin.size()), true);
    });
  }
  words.ForEachWith(word, [&](std::string_view longer) {
    const size_t at = longer.rfind(word);
    if (at == longer.npos || at < kPartLeastBytes || !IsEnding(longer.substr(at + word.size()))) return;
    add(longer, longer.substr(0, at), false);
  });
  if (found.size() > kCompoundsMax) return {};
  std::sort(found.begin(), found.end(), [](const Compound& a, const Compound& b) {
    return a.word.size() != b.word.size() ? a.word.size() < b.word.size() : a.word < b.word;
  });
  return found;
}

int64_t CountCompounding(Database& database, const DocSet& documents) {
  Statement row = database.Prepare("SELECT language FROM docs WHERE id = ?1");
  int64_t count = 0;
  documents.ForEach([&](int64_t id) {
    if (row.Bind(1, id).Step() && IsCompounding(LanguageOfNumber(row.Int(0)))) ++count;
    row.Reset();
    return true;
  });
  return count;
}

}  // namespace ferrox::engine
