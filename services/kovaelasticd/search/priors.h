#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/store_reader.h"

namespace ferrox::engine {

/// What of a document's row counts for its score beside words.
struct RankedRow {
  int64_t folder = 0;  ///< that it lies in
  int64_t mtime = 0;   ///< seconds since the epoch
  int32_t kind = 0;
  std::string ext;
};

/// What a document is worth for a query before any word is looked at: little, so that words decide among documents that
/// differ in them. For one search.
class Priors {
 public:
  /// `reader` must outlive this. @throws Error kEngineStorage.
  Priors(StoreReader& reader, const QueryNode& query) : reader_(reader) { (void)query; }

  /// What is added to the score; to `parts`, unless null, what it is made of.
  double Of(const RankedRow& row, std::vector<ScorePart>* parts) {
    (void)reader_, (void)row, (void)parts;
    return 0;
  }

 private:
  StoreReader& reader_;
};

}  // namespace ferrox::engine
