#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/search/query_evaluator.h"
#include "services/kovaelasticd/search/ranking_constants.h"
#include "services/kovaelasticd/search/relevance.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// One search over one snapshot of an index: finds the set of documents (QueryEvaluator), orders them by relevance
/// (RelevanceRanking) or by a column (ColumnOrder), and loads the page that is asked for. `reader` has a transaction
/// open for as long, which is what makes it one snapshot. What is given must outlive this.
class Searcher {
 public:
  Searcher(StoreReader& reader, const SearchRequest& request, const RankingConstants& constants)
      : reader_(reader), request_(request), constants_(constants), visible_(reader, request.asker) {}
  /// @throws Error kEngineStorage.
  SearchReply Run();

 private:
  void PutPage(const FoundDocuments& found, const FoundWords& words, SearchReply& reply);
  SearchHit LoadHit(const RankedDocument& ranked, const FoundWords& words);

  StoreReader& reader_;
  const SearchRequest& request_;
  const RankingConstants& constants_;
  const Visible visible_;
};

/// The search with a connection of `readers`. @throws Error kEngineStorage, IndexDamaged.
SearchReply SearchIn(ReaderPool& readers, const SearchRequest& request);

}  // namespace ferrox::engine
