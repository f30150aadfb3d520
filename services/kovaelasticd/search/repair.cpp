#include "services/kovaelasticd/search/repair.h"

#include <algorithm>
#include <cmath>
#include <memory>
#include <string_view>
#include <tuple>
#include <utility>

#include "services/kovaelasticd/search/typing_error.h"
#include "services/kovaelasticd/search/visible_count.h"
#include "services/kovaelasticd/store/word_list.h"

namespace ferrox::engine {

namespace {

constexpr size_t kRepairsMax = 3;
/// Words of fewer letters are not repaired, and those of fewer than the second may have one error only.
constexpr size_t kLettersOfOneError = 5;
constexpr size_t kLettersOfTwoErrors = 9;
/// A word that many documents have ends the search for less similar ones.
constexpr int64_t kMany = 10;
/// So many times as many documents as the word itself, where that was found.
constexpr int64_t kTimesMore = 20;
/// How unlikely an error is, as a logarithm.
constexpr double kErrorLog = 5;
/// What is less likely than the best by this is not offered.
constexpr double kLeastLikelihood = 0.1;

/// A word much like another one.
struct NearWord {
  int cost;  ///< TypingCost
  bool in_several;
  std::string word;
  int64_t documents = 0;  ///< visible ones
  double Score() const {
    return std::log(static_cast<double>(documents)) - kErrorLog * static_cast<double>(cost) / kTypingError;
  }
};

class Repairer {
 public:
  Repairer(StoreReader& reader, const Visible& visible, const WordList& words)
      : database_(reader.database), visible_(visible), words_(words) {}

  /// Whether there was more to do than is done for one search.
  bool IsExhausted() const { return counts_ > kCountsMax || hits_ > kHitsMax; }

  /// The words that may be meant by `rare`, the best first.
  std::vector<NearWord> Near(const RareWord& rare) {
    std::vector<NearWord> near = Like(rare);
    std::vector<NearWord> offered = Known(near, rare, true);
    // In a small collection a word may stand in one document.
    if (offered.empty() && rare.documents == 0) offered = Known(near, rare, false);
    return offered;
  }

 private:
  /// Of CountVisible: some 30 ms.
  static constexpr size_t kCountsMax = 200;
  static constexpr size_t kHitsMax = 300000;

  std::vector<NearWord> Like(const RareWord& rare) {
    const std::u32string typed = LettersOf(rare.word);
    std::vector<NearWord> near;
    if (typed.size() < kLettersOfOneError) return near;
    const int errors = typed.size() < kLettersOfTwoErrors || rare.documents > 0 ? 1 : 2;
    // Up to three bytes a letter.
    const int changes = typed.size() == rare.word.size() ? errors : 3 * errors;
    const auto margin = static_cast<size_t>(changes);
    words_.ForEachLike(rare.word, rare.word.size() - std::min(margin, rare.word.size()), rare.word.size() + margin,
                       changes, [&](std::string_view word, bool in_several) {
                         const int cost = TypingCost(typed, LettersOf(word), errors);
                         if (cost == 0 || cost >= (errors + 1) * kTypingError) return;
                         near.push_back({cost, in_several, std::string(word)});
                       });
    std::sort(near.begin(), near.end(),
              [](const NearWord& a, const NearWord& b) { return std::tie(a.cost, a.word) < std::tie(b.cost, b.word); });
    return near;
  }

  /// Those of `near` that two visible documents have, or that one has; the best first.
  std::vector<NearWord> Known(std::vector<NearWord>& near, const RareWord& rare, bool in_several) {
    const int64_t least = in_several ? std::max<int64_t>(2, kTimesMore * rare.documents) : 1;
    std::vector<NearWord> known;
    int64_t most = 0;
    int errors = 1;
    for (NearWord& word : near) {
      if (in_several && !word.in_several) continue;
      if (word.cost >= (errors + 1) * kTypingError) {
        if (most >= kMany || !in_several) break;
        ++errors;
      }
      if (IsExhausted()) return {};
      if (word.documents == 0) {
        ++counts_;
        word.documents = CountVisible(database_, visible_, word.word, hits_);
      }
      if (word.documents < least) continue;
      most = std::max(most, word.documents);
      known.push_back(word);
    }
    std::stable_sort(known.begin(), known.end(),
                     [](const NearWord& a, const NearWord& b) { return a.Score() > b.Score(); });
    return known;
  }

  Database& database_;
  const Visible& visible_;
  const WordList& words_;
  size_t counts_ = 0;
  size_t hits_ = 0;
};

}  // namespace

std::vector<Repair> RepairWords(StoreReader& reader, const Visible& visible, const std::vector<RareWord>& words) {
  const bool wanted = std::any_of(words.begin(), words.end(), [](const RareWord& rare) {
    return rare.word.size() >= kLettersOfOneError && WordList::Takes(rare.word);
  });
  if (!wanted) return {};
  const std::shared_ptr<const WordList> known = reader.words.Load(reader.database, visible.Version());
  if (known == nullptr) return {};
  Repairer repairer(reader, visible, *known);
  std::vector<Repair> repairs;
  for (size_t i = 0; i < words.size(); ++i) {
    if (!WordList::Takes(words[i].word)) continue;
    const std::vector<NearWord> near = repairer.Near(words[i]);
    if (repairer.IsExhausted()) return {};
    for (size_t n = 0; n < std::min(near.size(), kRepairsMax); ++n) {
      const double behind = std::exp((near[n].Score() - near.front().Score()) / 2);
      if (behind < kLeastLikelihood) break;
      repairs.push_back({i, near[n].word, behind * (1 - 0.2 * near[n].cost / kTypingError)});
    }
  }
  return repairs;
}

}  // namespace ferrox::engine
