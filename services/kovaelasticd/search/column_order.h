#pragma once

#include <vector>

#include "services/kovaelasticd/search/ties.h"
#include "services/kovaelasticd/store/doc_set.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"
#include "services/kovaelasticd/store/visible.h"

namespace ferrox::engine {

/// Orders documents by date, size or name; those without date or size come as if theirs were below all others. Equals
/// have the order of Ties, in both directions.
class ColumnOrder {
 public:
  /// All must outlive this.
  ColumnOrder(StoreReader& reader, const Visible& visible, const SearchRequest& request)
      : reader_(reader), visible_(visible), ties_(reader, visible), request_(request) {}

  /// The page that the request asks for, of `total` documents. @throws Error kEngineStorage.
  std::vector<RankedDocument> Page(const DocSet& documents, int64_t total);

 private:
  std::vector<RankedDocument> Fetched(const DocSet& documents);
  std::vector<RankedDocument> Walked(const DocSet& documents);
  RankedDocument Entry(int64_t id, const Statement& row, int column) const;
  /// Whether the column of `a` is before that of `b`.
  bool IsBefore(const RankedDocument& a, const RankedDocument& b) const;
  void DropLastEquals(std::vector<RankedDocument>& ranked, size_t first);

  // How many hits, from the first, the page needs to be in order, and those that it passes over.
  size_t Needed() const { return static_cast<size_t>(request_.offset + request_.limit); }
  size_t Skipped() const { return static_cast<size_t>(request_.offset); }

  StoreReader& reader_;
  const Visible& visible_;
  Ties ties_;
  const SearchRequest& request_;
};

}  // namespace ferrox::engine
