#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/search/query_evaluator.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// A document in its place among the hits.
struct RankedDocument {
  explicit RankedDocument(int64_t document) : id(document) {}
  int64_t id;
  double score = 0;
  int64_t number_key = 0;  ///< date or size, when hits are ordered by it
  std::string name_key;    ///< the name, when hits are ordered by it
};

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
class RelevanceRanking {
 public:
  /// `average_text_bytes`: of the index's documents with text. `words` must outlive this.
  RelevanceRanking(Database& database, const std::vector<RankedWord>& words, double average_text_bytes,
                   size_t ranked_max)
      : database_(database), words_(words), average_text_(average_text_bytes), ranked_max_(ranked_max) {}

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
  static std::vector<size_t> PlacesBetween(const std::vector<Candidate>& candidates, size_t begin, size_t end);
  std::vector<RankedDocument> RankBlock(const std::vector<Candidate>& candidates, const std::vector<uint8_t>& counts,
                                        size_t begin, size_t end);
  double CloseScore(const Candidate& candidate, const uint8_t* counts);
  double LengthFactor(int64_t id, double& freshness);

  Database& database_;
  const std::vector<RankedWord>& words_;
  const double average_text_;
  const size_t ranked_max_;
};

}  // namespace ferrox::engine
