#pragma once

#include <cstdint>
#include <vector>

#include "services/kovaelasticd/search/ranked_word.h"
#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/store/index_store.h"

namespace ferrox::engine {

/// What of a document decides how much its words count.
struct DocumentShape {
  double length = 1;     ///< of the text, in averages of the index, damped (WordValue::Length)
  double of_name = 1;    ///< the share of its name that the words of the query are
  bool is_name = false;  ///< the words of the query are its name, and nothing else
};

/// What one word adds to a document's score, without its nearness to others.
class WordValue {
 public:
  /// Must outlive this.
  explicit WordValue(const RankingConstants& constants) : c_(constants) {}

  /// What `hit` adds.
  double Of(const RankedWord& word, const TermHit& hit, const DocumentShape& shape) const;
  /// What the folders above a document add that they have the word in their names.
  double OfFolder(const RankedWord& word) const { return word.folder_rarity * c_.in_folder; }
  /// The same as Of, place by place.
  void Explain(const RankedWord& word, const TermHit& hit, const DocumentShape& shape,
               std::vector<ScorePart>& parts) const;
  /// 1 for a text of average length.
  double Length(double averages) const { return 1 - c_.b + c_.b * averages; }

 private:
  double Places(uint8_t places, const DocumentShape& shape) const;
  double Text(const RankedWord& word, const TermHit& hit, double length) const;

  const RankingConstants& c_;
};

}  // namespace ferrox::engine
