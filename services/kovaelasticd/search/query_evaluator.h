#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/fts.h"
#include "services/kovaelasticd/store/sqlite_db.h"
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
  /// `documents`: how many the index has. `hits_max`: of how many documents, those added last, each word's hits are
  /// kept for ranking; the sets are complete in any case. `hidden`, which may be null, are never found.
  QueryEvaluator(Database& database, FolderTree& tree, int64_t documents, size_t hits_max, const DocSet* hidden)
      : database_(database), tree_(tree), documents_(documents), hits_max_(hits_max), hidden_(hidden) {}

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
  DocSet AllDocuments();
  DocSet DocumentsAt(const std::string& path);
  void ApplyFilter(DocSet& documents, const QueryNode& filter, bool wanted);
  bool MatchesFilter(int64_t id, const QueryNode& filter);
  void CollectWords(const QueryNode& node, HitCollector& content, HitCollector& meta);

  Database& database_;
  FolderTree& tree_;
  const int64_t documents_;
  const size_t hits_max_;
  const DocSet* const hidden_;
  FoundWords found_words_;
};

}  // namespace ferrox::engine
