#pragma once

#include <cstdint>
#include <vector>

#include "services/kovaelasticd/search/ranked_word.h"
#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/fts_positions.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// What it adds to the scores of documents that words of the query stand close together in their texts and titles, in
/// the order of the query more so. For a few hundred documents: their positions are read by a second walk over the
/// words' documents, of the rarer words alone.
class Nearness {
 public:
  /// `words` are in the order of the query. All must outlive this.
  Nearness(Database& database, const std::vector<RankedWord>& words, const RankingConstants& constants);

  /// Of documents in ascending order, one value each. @throws Error kEngineStorage.
  std::vector<double> Of(const std::vector<int64_t>& documents) const;

 private:
  void Add(const char* table, const char* column, double worth, const std::vector<int64_t>& documents,
           const DocSet& wanted, std::vector<double>& values) const;
  double Value(const WordPosition* begin, const WordPosition* end, double worth) const;

  Database& database_;
  const std::vector<RankedWord>& words_;
  const RankingConstants& constants_;
  std::vector<size_t> looked_at_;  ///< positions in `words`
};

}  // namespace ferrox::engine
