#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "common/error.h"
#include "services/kovaelasticd/indices/registry.h"
#include "services/kovaelasticd/store/asker.h"
#include "services/kovaelasticd/store/index_store.h"

namespace ferrox::engine {

/// One of the indices that a search asks, and for whom.
struct AskedIndex {
  Registry::OpenIndex open;
  std::optional<Asker> asker = std::nullopt;  ///< nothing: whoever gets the answer may see everything
  bool failed = false;                        ///< it could not be searched, and is asked no more
};

/// A hit, and the position of its index in the list of those that were asked.
struct IndexHit {
  size_t index;
  SearchHit hit;
};

/// The replies of all indices in one; SearchReply says what the members are. An index that has no document with all
/// words, and shows what has some in their place (none_has_all), counts only where no other index has any.
struct MergedReply {
  int64_t total = 0;
  std::optional<int64_t> total_all;  ///< nothing where it is `total`
  bool ranking_bounded = false;
  bool none_has_all = false;
  std::vector<std::string> ignored;      ///< words that find none by themselves in any index where anything was found
  std::vector<RepairedWord> repaired;    ///< of each index, each once
  std::vector<RepairedWord> synonyms;    ///< likewise; unless hits are explained, only where a word itself finds none
  std::vector<IndexHit> hits;            ///< the page
  std::vector<std::string> suggestions;  ///< of each index, each once
  std::vector<std::string> hints;        ///< likewise
};

/// Called with an index that cannot be searched; throws when the whole search is to fail.
using LeaveOutFunction = std::function<void(const AskedIndex& asked, const Error& error)>;

/// The page of a search over several indices, the best of each merged: always the best of the foremost hits comes next,
/// of equals that of the index named first. So the hits before any place are the same however many are asked for.
MergedReply SearchIndices(std::vector<AskedIndex>& indices, const SearchRequest& request,
                          const LeaveOutFunction& leave_out);

}  // namespace ferrox::engine
