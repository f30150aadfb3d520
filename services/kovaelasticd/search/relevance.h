#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/search/query_evaluator.h"
#include "services/kovaelasticd/search/ties.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// The part of all hits that is asked for, from `begin` to before `end`.
struct PageOrder {
  size_t begin;
  size_t end;
  bool ascending;  ///< counted from the least
};

/// Orders documents by how well they match the words of a query. The score of a document is the sum over the words of
/// weight * (occurrences in the content + value of the places in name, title and fields), and a little for a recent
/// file. It is computed in two steps, since the length and the date of a text cost reading its row: a quick score for
/// all from the hits alone, and the close score for blocks of kCloseBlock documents in the order of the quick one.
/// Equals have the order of their paths within a block; which block they are in is decided by their numbers, later ones
/// first, and for an asker by PathKeys.
class RelevanceRanking {
 public:
  /// What is given must outlive this. The visible documents with text give the average length.
  RelevanceRanking(StoreReader& reader, const Visible& visible, const std::vector<RankedWord>& words,
                   size_t ranked_max);

  /// The documents of the page in their order, best first unless ascending. `total` is the number of `documents`;
  /// `bounded` becomes whether there were too many to rank all. @throws Error kEngineStorage.
  std::vector<RankedDocument> Page(const DocSet& documents, int64_t total, const PageOrder& order, bool& bounded);

 private:
  /// A document that may be among the best.
  struct Candidate {
    int64_t id;
    float score;        ///< the quick score
    float place_score;  ///< the part of it for words beside the content, which the close score keeps
  };
  std::vector<Candidate> Candidates(const DocSet& documents, int64_t total, bool& bounded) const;
  template <typename Take>
  static void ForEachCandidateHit(const std::vector<Candidate>& candidates, const std::vector<WordHit>& hits,
                                  Take take);
  void ScoreQuickly(std::vector<Candidate>& candidates, std::vector<uint8_t>& counts) const;
  std::vector<uint64_t> Keys(const std::vector<Candidate>& candidates) const;
  std::vector<size_t> PlacesBetween(const std::vector<Candidate>& candidates, const std::vector<uint64_t>& keys,
                                    size_t begin, size_t end);
  std::vector<RankedDocument> RankBlock(const std::vector<Candidate>& candidates, const std::vector<uint8_t>& counts,
                                        const std::vector<size_t>& places, size_t begin, size_t end);
  double CloseScore(const Candidate& candidate, const uint8_t* counts);
  double LengthFactor(int64_t id, double& freshness);

  Database& database_;
  const Visible& visible_;
  Ties ties_;
  const std::vector<RankedWord>& words_;
  const double average_text_;
  const size_t ranked_max_;
};

}  // namespace ferrox::engine
