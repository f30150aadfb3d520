#include "services/kovaelasticd/commands/merged_search.h"

#include <algorithm>
#include <iterator>
#include <tuple>
#include <utility>

#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// Whether `a` comes before `b` in the reply.
bool ComesFirst(const SearchRequest& request, const IndexHit& a, const IndexHit& b) {
  const SearchHit& first = request.ascending ? a.hit : b.hit;
  const SearchHit& second = request.ascending ? b.hit : a.hit;
  if (request.sort == SortKey::kRelevance) return first.score < second.score;
  if (request.sort == SortKey::kName) return CompareNames(first.name_key, second.name_key) < 0;
  return first.number_key < second.number_key;
}

/// The first `wanted` hits of all indices. Each index's own order stays as it is, because the scores of one index do
/// not fall steadily: always the best of the foremost hits comes next, of equals that of the index named first. So the
/// hits before any place are the same however many are wanted.
std::vector<IndexHit> Merge(std::vector<std::vector<IndexHit>> of_index, const SearchRequest& request, size_t wanted) {
  std::vector<IndexHit> merged;
  std::vector<size_t> next(of_index.size(), 0);
  while (merged.size() < wanted) {
    IndexHit* first = nullptr;
    size_t from = 0;
    for (size_t i = 0; i < of_index.size(); ++i) {
      if (next[i] == of_index[i].size()) continue;
      IndexHit& foremost = of_index[i][next[i]];
      if (first == nullptr || ComesFirst(request, foremost, *first)) std::tie(first, from) = std::pair(&foremost, i);
    }
    if (first == nullptr) break;
    merged.push_back(std::move(*first));
    ++next[from];
  }
  return merged;
}

void MakeUnique(std::vector<std::string>& words) {
  std::sort(words.begin(), words.end());
  words.erase(std::unique(words.begin(), words.end()), words.end());
}

/// Searches one index, and adds its sums to those of all.
std::vector<IndexHit> SearchOne(const AskedIndex& asked, size_t index, SearchRequest request, MergedReply& merged) {
  request.asker = asked.asker.has_value() ? &*asked.asker : nullptr;
  SearchReply reply = asked.open.index->Search(request);
  merged.total += reply.total;
  merged.ranking_bounded = merged.ranking_bounded || reply.ranking_bounded;
  for (std::string& word : reply.suggestions) merged.suggestions.push_back(std::move(word));
  std::vector<IndexHit> hits;
  hits.reserve(reply.hits.size());
  for (SearchHit& hit : reply.hits) hits.push_back({index, std::move(hit)});
  return hits;
}

}  // namespace

MergedReply SearchIndices(std::vector<AskedIndex>& indices, const SearchRequest& request,
                          const LeaveOutFunction& leave_out) {
  const bool merges = indices.size() > 1;
  SearchRequest each = request;
  if (merges) {
    each.offset = 0;
    each.limit = request.offset + request.limit;
  }
  MergedReply merged;
  std::vector<std::vector<IndexHit>> of_index;
  for (size_t i = 0; i < indices.size(); ++i) {
    if (indices[i].failed) continue;
    try {
      of_index.push_back(SearchOne(indices[i], i, each, merged));
    } catch (const Error& error) {
      indices[i].failed = true;
      leave_out(indices[i], error);
    }
  }
  MakeUnique(merged.suggestions);
  if (!merges) {
    if (!of_index.empty()) merged.hits = std::move(of_index.front());
    return merged;
  }
  merged.hits = Merge(std::move(of_index), request, static_cast<size_t>(each.limit));
  merged.hits.erase(merged.hits.begin(),
                    merged.hits.begin() + std::min<ptrdiff_t>(request.offset, std::ssize(merged.hits)));
  return merged;
}

}  // namespace ferrox::engine
