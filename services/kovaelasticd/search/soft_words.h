#pragma once

#include <algorithm>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/query/synonyms.h"
#include "services/kovaelasticd/search/ranked_word.h"
#include "services/kovaelasticd/search/term_hits.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"
#include "services/kovaelasticd/store/word_list.h"

namespace ferrox::engine {

/// The plain words of a query, of which documents need not have all. A word in more than a quarter of the visible
/// documents is common: it finds none by itself when a rarer one stands beside it, though it scores. In very many
/// documents it does not score either, and is not walked through to its end, which is what most of the time would go
/// to: it is ignored, as are all but the rarest of very many words.
/// What is in no visible document, or hardly in any, is looked for as what was probably meant, too (RepairWords).
class SoftWords {
 public:
  /// `hits_max` as in HitCollector; all must outlive this.
  SoftWords(StoreReader& reader, const Visible& visible, size_t hits_max, const RankingConstants& constants,
            const SearchRequest& request)
      : reader_(reader), visible_(visible), hits_max_(hits_max), constants_(constants), request_(request) {}

  /// Looks for the words; `rare_beside`: a required one that is rare stands beside them.
  /// @throws Error kEngineStorage, as all that follow.
  void Find(const std::vector<const QueryNode*>& nodes, bool rare_beside);

  /// Whether some word finds documents by itself.
  bool AnyCounts() const;
  /// The documents that have one of those words.
  DocSet Any() const;
  /// Leaves the documents that have all words, the ignored ones too.
  void KeepAll(DocSet& documents);

  /// The words that find none by themselves.
  std::vector<std::string> Ignored() const;
  const std::vector<RepairedWord>& Repaired() const { return repaired_; }
  const std::vector<RepairedWord>& UsedSynonyms() const { return used_synonyms_; }
  /// SearchReply::documents.
  const std::map<std::string, int64_t>& WordDocuments() const { return word_documents_; }
  /// Hands the words that score over.
  std::vector<RankedWord> TakeRanked();

 private:
  struct Word {
    const QueryNode* node;
    const QueryNode* group;
    std::string text;  ///< folded
    std::vector<WordForm> forms;
    std::unique_ptr<TermCollector> found;
    DocSet folders = {};
    bool is_ignored = false;
    bool is_common = false;    ///< not ignored, but admits no document
    bool is_function = false;  ///< FindFunctionWords; admits none either
    int64_t elsewhere = 0;     ///< SearchRequest::elsewhere
    bool own_first = false;    ///< repairs go beside it
    std::vector<std::string> repairs = {};
    std::vector<std::string> related = {};
    size_t synonyms = 0;  ///< of `related`, the first ones
  };

  /// A word to be looked for.
  struct Wanted {
    const QueryNode* node;
    const QueryNode* group;    ///< the first of the words that it may be one number or code with, else null
    bool is_function = false;  ///< FindFunctionWords
  };
  static std::vector<Wanted> Distinct(const std::vector<const QueryNode*>& nodes);
  static void MarkFunctionWords(std::vector<Wanted>& wanted);
  Word MakeWord(const Wanted& wanted) const;
  bool IsCommon(int64_t documents) const { return documents > CommonMax(); }
  int64_t CommonMax() const { return visible_.Documents() / constants_.common_part; }
  /// In so many documents words are walked through.
  int64_t WalkedMax() const { return std::max(CommonMax(), constants_.common_scored_max); }
  std::vector<bool> Rarest(const std::vector<Wanted>& wanted);
  void FindSpellings(Word& word) const;
  bool MayHaveCompounds();
  void FindCompounds();
  void TakeCompounds(Word& word, const WordList& known);
  void FindSynonyms(const std::vector<const QueryNode*>& nodes);
  bool TakeRelated(Word& word, const std::string& shown, const std::vector<WordForm>& forms, double share);
  void LookForRepairs();
  void TakeRepair(Word& word, const std::string& other, double likelihood);
  void FindElsewhere(Word& word);
  void KeepIgnored(DocSet& documents, const Word& word);
  bool Has(int64_t id, const Word& word);

  StoreReader& reader_;
  const Visible& visible_;
  const size_t hits_max_;
  const RankingConstants& constants_;
  const SearchRequest& request_;
  std::vector<Word> words_;
  std::vector<RepairedWord> repaired_;
  std::vector<RepairedWord> used_synonyms_;
  std::map<std::string, int64_t> word_documents_;
};

}  // namespace ferrox::engine
