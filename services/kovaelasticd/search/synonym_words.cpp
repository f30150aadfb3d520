#include "services/kovaelasticd/search/synonym_words.h"

#include <algorithm>

namespace ferrox::engine {

namespace {

constexpr std::ptrdiff_t kOfWordMax = 16;

std::string Joined(const Synonyms::Words& words) {
  std::string text;
  for (const std::string& word : words) text += (text.empty() ? "" : " ") + word;
  return text;
}

}  // namespace

std::vector<SynonymOfWord> SynonymsIn(const std::vector<std::string>& words, const Synonyms& synonyms) {
  std::vector<SynonymOfWord> found;
  const auto add = [&](size_t of, const Synonyms::Words& from, const Synonyms::Words& other) {
    const auto count = std::count_if(found.begin(), found.end(),
                                     [&](const SynonymOfWord& known) { return words[known.of] == words[of]; });
    const bool is_known = std::any_of(found.begin(), found.end(), [&](const SynonymOfWord& known) {
      return words[known.of] == words[of] && known.words == other;
    });
    if (!is_known && count < kOfWordMax) found.push_back({of, Joined(from), Joined(other), other});
  };
  for (size_t begin = 0; begin < words.size(); ++begin) {
    Synonyms::Words phrase;
    for (size_t end = begin; end < words.size() && !words[end].empty() && phrase.size() < Synonyms::kPhraseMax; ++end) {
      phrase.push_back(words[end]);
      for (const Synonyms::Words& other : synonyms.Of(phrase)) {
        for (size_t of = begin; of <= end; ++of) add(of, phrase, other);
      }
    }
  }
  return found;
}

}  // namespace ferrox::engine
