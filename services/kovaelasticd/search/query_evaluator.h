#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"
#include "services/kovaelasticd/text/snippet.h"

namespace ferrox::engine {

/// A word or phrase of a query that documents are ranked by, and where it was found.
struct RankedWord {
  double weight = 0;             ///< ln(1 + all documents / documents that have it): the rarer, the more
  std::vector<WordHit> content;  ///< in ascending order of documents; those of several expressions follow each other
  std::vector<WordHit> meta;
};

/// The words of a query, apart from those behind NOT.
struct FoundWords {
  std::vector<RankedWord> ranked;
  std::vector<std::string> looked_for;  ///< folded, for other spellings
  std::vector<SnippetWord> marked;      ///< for snippets
};

/// Finds the documents that a query asks for, as sets of document numbers: one bit for each document of the index, so
/// that conditions are joined by bit operations. For one query and one snapshot.
class QueryEvaluator {
 public:
  /// `hits_max`: of how many documents each word's hits are kept for ranking (HitCollector); the sets are complete in
  /// any case. Nothing that is not `visible` is found, or counts. Both must outlive this.
  QueryEvaluator(StoreReader& reader, const Visible& visible, size_t hits_max)
      : reader_(reader), database_(reader.database), visible_(visible), hits_max_(hits_max) {}

  /// @throws Error kEngineStorage.
  DocSet Evaluate(const QueryNode& query) { return Evaluate(query, true); }
  /// Of all that was evaluated.
  const FoundWords& Words() const { return found_words_; }

 private:
  // `ranking`: words found count for the order of the documents; they do not below a NOT.
  DocSet Evaluate(const QueryNode& node, bool ranking);
  DocSet EvaluateAll(const QueryNode& node, bool ranking);
  DocSet EvaluateWords(const QueryNode& node, bool ranking);
  DocSet EvaluateFilter(const QueryNode& node);
  void ApplyFilter(DocSet& documents, const QueryNode& filter, bool wanted);
  bool MatchesFilter(int64_t id, const QueryNode& filter);
  void CollectWords(const QueryNode& node, HitCollector& content, HitCollector& meta);

  StoreReader& reader_;
  Database& database_;
  const Visible& visible_;
  const size_t hits_max_;
  FoundWords found_words_;
};

}  // namespace ferrox::engine
