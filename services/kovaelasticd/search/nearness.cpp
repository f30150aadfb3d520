#include "services/kovaelasticd/search/nearness.h"

#include <algorithm>
#include <array>
#include <string>
#include <tuple>
#include <utility>

namespace ferrox::engine {

namespace {

/// So many words may be looked at, whatever the constants say.
constexpr size_t kTermsMax = 16;
/// Words further apart add nothing.
constexpr uint32_t kFarthest = 16;

/// Positions as CollectPositions finds them: in runs in the order of documents. Hands out those of one document.
class PositionRuns {
 public:
  explicit PositionRuns(const std::vector<WordPosition>& positions) {
    const WordPosition* const last = positions.data() + positions.size();
    for (const WordPosition* begin = positions.data(); begin != last;) {
      const WordPosition* end = std::is_sorted_until(
          begin, last, [](const WordPosition& a, const WordPosition& b) { return a.document < b.document; });
      runs_.push_back({begin, end});
      begin = end;
    }
  }

  /// In the order of the text; to be asked for in ascending order of documents, each that has positions.
  const std::vector<WordPosition>& Of(int64_t document) {
    found_.clear();
    for (auto& [at, end] : runs_) {
      while (at != end && at->document == document) found_.push_back(*at++);
    }
    std::sort(found_.begin(), found_.end(), [](const WordPosition& a, const WordPosition& b) {
      return std::tie(a.position, a.term) < std::tie(b.position, b.term);
    });
    return found_;
  }

 private:
  std::vector<std::pair<const WordPosition*, const WordPosition*>> runs_;
  std::vector<WordPosition> found_;
};

}  // namespace

Nearness::Nearness(Database& database, const std::vector<RankedWord>& words, const RankingConstants& constants)
    : database_(database), words_(words), constants_(constants) {
  for (size_t i = 0; i < words.size(); ++i) {
    const RankedWord& word = words[i];
    const bool is_read = !word.phrases.empty() && word.documents > 0 && word.documents <= constants.near_documents_max;
    if (is_read) looked_at_.push_back(i);
  }
  const size_t most = std::min(constants.near_words_max, kTermsMax);
  if (looked_at_.size() > most) {
    std::stable_sort(looked_at_.begin(), looked_at_.end(),
                     [&](size_t a, size_t b) { return words[a].rarity > words[b].rarity; });
    looked_at_.resize(most);
    std::sort(looked_at_.begin(), looked_at_.end());
  }
}

std::vector<double> Nearness::Of(const std::vector<int64_t>& documents) const {
  std::vector<double> values(documents.size(), 0);
  if (looked_at_.size() < 2) return values;
  DocSet wanted;
  for (const int64_t id : documents) wanted.Add(id);
  if (constants_.near_text > 0) Add("content_fts", "", constants_.near_text, documents, wanted, values);
  if (constants_.near_title > 0) Add("meta_fts", "{title} : ", constants_.near_title, documents, wanted, values);
  return values;
}

void Nearness::Add(const char* table, const char* column, double worth, const std::vector<int64_t>& documents,
                   const DocSet& wanted, std::vector<double>& values) const {
  std::vector<WordPosition> positions;
  for (size_t term = 0; term < looked_at_.size(); ++term) {
    std::string expression;
    for (const std::string& phrase : words_[looked_at_[term]].phrases) {
      expression += (expression.empty() ? "" : " OR ") + (column + ("(" + phrase)) + ")";
    }
    CollectPositions(database_, table, expression,
                     {wanted, constants_.near_positions_max, static_cast<uint8_t>(term), positions});
  }
  PositionRuns runs(positions);
  for (size_t i = 0; i < documents.size(); ++i) {
    const std::vector<WordPosition>& found = runs.Of(documents[i]);
    if (found.size() > 1) values[i] += Value(found.data(), found.data() + found.size(), worth);
  }
}

/// Of one document. Neighbours among the positions count, the closer the more, and each two words together up to what
/// the rarer of them is worth.
double Nearness::Value(const WordPosition* begin, const WordPosition* end, double worth) const {
  std::array<float, kTermsMax * kTermsMax> near{};
  bool any = false;
  for (const WordPosition* at = begin; end - at > 1; ++at) {
    const uint32_t apart = std::max<uint32_t>(1, at[1].position - at->position);
    if (at->term == at[1].term || apart > kFarthest) continue;
    const bool in_order = at->term < at[1].term;
    const size_t pair = std::min(at->term, at[1].term) * kTermsMax + std::max(at->term, at[1].term);
    near[pair] += static_cast<float>((in_order ? 1 : constants_.near_backwards) / (apart * apart));
    any = true;
  }
  double value = 0;
  for (size_t a = 0; any && a < looked_at_.size(); ++a) {
    for (size_t b = a + 1; b < looked_at_.size(); ++b) {
      const auto sum = static_cast<double>(near[a * kTermsMax + b]);
      if (sum == 0) continue;
      const double rarity = std::min(words_[looked_at_[a]].rarity, words_[looked_at_[b]].rarity);
      value += worth * rarity * sum / (sum + constants_.near_half);
    }
  }
  return value;
}

}  // namespace ferrox::engine
