#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/doc_set.h"
#include "services/kovaelasticd/fts.h"
#include "services/kovaelasticd/snippet.h"
#include "services/kovaelasticd/sqlite_store.h"

namespace ferrox::engine {

/// One search over one snapshot of an index: finds the set of documents, orders them, loads a page.
class Searcher {
 public:
  Searcher(StoreReader& reader, const SearchRequest& request) : reader_(reader), request_(request) {}
  SearchReply Run();

 private:
  /// A word that documents are ranked by, and where it was found.
  struct Term {
    double weight = 0;  ///< the rarer, the more
    std::vector<WordHit> content;
    std::vector<WordHit> meta;
  };
  /// A document that may be among the best.
  struct Candidate {
    int64_t id;
    float score;        ///< at first sight
    float place_score;  ///< the part of it for words beside the content
  };
  /// A document in its place.
  struct Ranked {
    explicit Ranked(int64_t document) : id(document) {}
    int64_t id;
    double score = 0;
    int64_t number_key = 0;  ///< date or size
    std::string name_key;
  };

  // Which documents.
  DocSet Evaluate(const QueryNode& node, bool ranking);
  DocSet EvaluateAll(const QueryNode& node, bool ranking);
  DocSet EvaluateWords(const QueryNode& node, bool ranking);
  DocSet EvaluateFilter(const QueryNode& node);
  DocSet AllDocuments();
  void ApplyFilter(DocSet& documents, const QueryNode& filter, bool wanted);
  bool MatchesFilter(int64_t id, const QueryNode& filter);
  void CollectWords(const QueryNode& node, HitCollector& content, HitCollector& meta);

  // In which order.
  std::vector<Ranked> RankByRelevance(const DocSet& documents, int64_t total, bool& bounded);
  std::vector<Candidate> Candidates(const DocSet& documents, int64_t total, bool& bounded);
  template <typename Take>
  static void ForEachCandidateHit(const std::vector<Candidate>& candidates, const std::vector<WordHit>& hits,
                                  Take take);
  void ScoreAtFirstSight(std::vector<Candidate>& candidates, std::vector<uint8_t>& counts);
  static std::vector<size_t> PlacesBetween(const std::vector<Candidate>& candidates, size_t begin, size_t end);
  std::vector<Ranked> RankBlock(const std::vector<Candidate>& candidates, const std::vector<uint8_t>& counts,
                                size_t begin, size_t end);
  double CloseScore(const Candidate& candidate, const uint8_t* counts);
  double LengthFactor(int64_t id, double& freshness);
  std::vector<Ranked> OrderByColumn(const DocSet& documents, int64_t total);
  std::vector<Ranked> OrderFetched(const DocSet& documents);
  std::vector<Ranked> OrderByWalk(const DocSet& documents);
  size_t Needed() const { return static_cast<size_t>(request_.offset + request_.limit); }

  // What is shown.
  SearchHit LoadHit(const Ranked& ranked);
  std::vector<std::string> Suggest();
  std::vector<std::string> SuggestWord(const std::string& word);

  StoreReader& reader_;
  const SearchRequest& request_;
  std::vector<Term> terms_;
  std::vector<std::string> words_;   ///< those looked for, for suggestions
  std::vector<SnippetWord> marked_;  ///< those marked in snippets
  int64_t documents_ = 0;
  double average_text_ = 1;
};

}  // namespace ferrox::engine
