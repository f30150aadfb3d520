#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "services/kovaelasticd/search/nearness.h"
#include "services/kovaelasticd/search/priors.h"
#include "services/kovaelasticd/search/ranked_word.h"
#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/search/ties.h"
#include "services/kovaelasticd/search/word_value.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// The part of all hits that is asked for, from `begin` to before `end`.
struct PageOrder {
  size_t begin;
  size_t end;
  bool ascending;  ///< counted from the least
};

/// Orders documents by how well they match the words of a query. A score is the sum of what the words add (WordValue),
/// of their nearness to each other, and of what the document is worth by itself (Priors). It is computed in two steps,
/// since the length and the date of a text cost reading its row: a quick score for all from the hits alone, and the
/// close score for blocks of kCloseBlock documents in the order of the quick one. Equals have the order of their paths
/// within a block; which block they are in is decided by their numbers, later ones first, and for an asker by PathKeys.
class RelevanceRanking {
 public:
  /// What is given must outlive this. The visible documents with text give the average length.
  RelevanceRanking(StoreReader& reader, const Visible& visible, const std::vector<RankedWord>& words,
                   const SearchRequest& request, const RankingConstants& constants);

  /// The documents of the page in their order, best first unless ascending. `total` is the number of `documents`;
  /// `bounded` becomes whether there were too many to rank all. @throws Error kEngineStorage.
  std::vector<RankedDocument> Page(const DocSet& documents, int64_t total, const PageOrder& order, bool& bounded);
  /// What the score of a document is made of, what adds most first. @throws Error kEngineStorage.
  std::vector<ScorePart> Explain(int64_t id);

 private:
  /// A document that may be among the best.
  struct Candidate {
    int64_t id;
    float score;  ///< the quick score
  };
  std::vector<Candidate> Candidates(const DocSet& documents, int64_t total, bool& bounded) const;
  void ScoreQuickly(std::vector<Candidate>& candidates) const;
  std::vector<uint64_t> Keys(const std::vector<Candidate>& candidates) const;
  std::vector<int64_t> DocumentsBetween(const std::vector<Candidate>& candidates, const std::vector<uint64_t>& keys,
                                        size_t begin, size_t end);
  std::vector<RankedDocument> RankBlock(std::vector<int64_t> documents, size_t begin, size_t end);
  double CloseScore(int64_t id, std::vector<ScorePart>* parts);
  double ReadRow(int64_t id, DocumentShape& shape, size_t& name_letters, std::vector<ScorePart>* parts);

  Database& database_;
  const Visible& visible_;
  Ties ties_;
  const std::vector<RankedWord>& words_;
  const double average_text_;
  const size_t ranked_max_;
  const RankingConstants constants_;  ///< for this query
  const WordValue value_;
  const Nearness nearness_;
  Priors priors_;
};

}  // namespace ferrox::engine
