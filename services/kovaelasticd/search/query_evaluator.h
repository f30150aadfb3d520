#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/search/ranked_word.h"
#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/search/soft_words.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// What a query finds.
struct FoundDocuments {
  DocSet documents;
  std::optional<DocSet> with_all;    ///< of these, those with all words; nothing where all have them
  std::vector<std::string> ignored;  ///< as in SearchReply, like the next four
  std::vector<RepairedWord> repaired;
  std::vector<RepairedWord> synonyms;
  std::map<std::string, int64_t> word_documents;
  bool none_has_all = false;
};

/// Finds the documents that a query asks for, as sets of document numbers: one bit for each document of the index, so
/// that conditions are joined by bit operations. For one query and one snapshot.
class QueryEvaluator {
 public:
  /// `hits_max`: of how many documents each word's hits are kept for ranking (HitCollector); the sets are complete in
  /// any case. Nothing that is not `visible` is found, or counts. All must outlive this.
  QueryEvaluator(StoreReader& reader, const Visible& visible, size_t hits_max, const RankingConstants& constants,
                 const SearchRequest& request)
      : reader_(reader),
        database_(reader.database),
        visible_(visible),
        hits_max_(hits_max),
        constants_(constants),
        soft_(reader, visible, hits_max, constants, request) {}

  /// `all_words`: documents must have all words, unless there is none that does. To be called once.
  /// @throws Error kEngineStorage.
  FoundDocuments Find(const QueryNode& query, bool all_words);
  /// Of all that was evaluated.
  const FoundWords& Words() const { return found_words_; }

 private:
  // `ranking`: words found count for the order of the documents; they do not below a NOT.
  DocSet Evaluate(const QueryNode& node, bool ranking);
  DocSet EvaluateAll(const QueryNode& node, bool ranking, bool without_soft = false);
  DocSet EvaluateWords(const QueryNode& node, bool ranking);
  DocSet EvaluatePattern(const QueryNode& node, bool ranking);
  DocSet EvaluateFilter(const QueryNode& node);
  void ApplyFilter(DocSet& documents, const QueryNode& filter, bool wanted);
  bool MatchesFilter(int64_t id, const QueryNode& filter);
  FoundDocuments FindSoftly(const QueryNode& query, const std::vector<const QueryNode*>& soft, bool all_words);
  bool HasRareWord() const;
  void NoteWords(const QueryNode& node);

  StoreReader& reader_;
  Database& database_;
  const Visible& visible_;
  const size_t hits_max_;
  const RankingConstants& constants_;
  SoftWords soft_;
  FoundWords found_words_;
};

}  // namespace ferrox::engine
