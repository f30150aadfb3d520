#include "services/kovaelasticd/query/synonyms.h"

#include <algorithm>

#include "services/kovaelasticd/text/words.h"

namespace ferrox::engine {

namespace {

std::vector<Synonyms::Words> FoldAll(const Synonyms::Words& written) {
  std::vector<Synonyms::Words> folded;
  for (const std::string& text : written) {
    Synonyms::Words words = SplitQueryText(text, false).words;
    if (!words.empty() && words.size() <= Synonyms::kPhraseMax) folded.push_back(std::move(words));
  }
  return folded;
}

}  // namespace

Synonyms::Synonyms(const std::vector<Rule>& rules) {
  for (const Rule& rule : rules) {
    const std::vector<Words> others = FoldAll(rule.second);
    for (const Words& from : FoldAll(rule.first)) {
      std::vector<Words>& known = others_[from];
      for (const Words& other : others) {
        const bool is_new = other != from && std::find(known.begin(), known.end(), other) == known.end();
        if (is_new && known.size() < kOthersMax) known.push_back(other);
      }
    }
  }
}

const std::vector<Synonyms::Words>& Synonyms::Of(const Words& words) const {
  static const std::vector<Words> kNone;
  const auto known = others_.find(words);
  return known == others_.end() ? kNone : known->second;
}

}  // namespace ferrox::engine
