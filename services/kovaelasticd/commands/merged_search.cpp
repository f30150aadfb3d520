#include "services/kovaelasticd/commands/merged_search.h"

#include <algorithm>
#include <iterator>
#include <map>
#include <optional>
#include <string>
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

/// The reply of the index at `index` in the list of those that were asked.
struct IndexReply {
  size_t index;
  SearchReply reply;
};

/// Asks one index. When it fails it is marked, and told to `leave_out`.
std::optional<SearchReply> Ask(AskedIndex& asked, SearchRequest request, const LeaveOutFunction& leave_out) {
  request.asker = asked.asker.has_value() ? &*asked.asker : nullptr;
  try {
    return asked.open.index->Search(request);
  } catch (const Error& error) {
    asked.failed = true;
    leave_out(asked, error);
    return std::nullopt;
  }
}

/// Asks each index by itself.
std::vector<IndexReply> AskAll(std::vector<AskedIndex>& indices, const SearchRequest& request,
                               const LeaveOutFunction& leave_out) {
  std::vector<IndexReply> replies;
  for (size_t i = 0; i < indices.size(); ++i) {
    if (indices[i].failed) continue;
    if (auto reply = Ask(indices[i], request, leave_out); reply.has_value()) replies.push_back({i, std::move(*reply)});
  }
  return replies;
}

/// In how many documents of the other indices the words stand that this one has repaired.
std::map<std::string, int64_t> HeldElsewhere(const std::vector<IndexReply>& replies, const IndexReply& repaired) {
  std::map<std::string, int64_t> held;
  for (const RepairedWord& word : repaired.reply.repaired) {
    int64_t documents = 0;
    for (const IndexReply& other : replies) {
      const auto own = other.reply.documents.find(word.from);
      if (&other != &repaired && own != other.reply.documents.end()) documents += own->second;
    }
    if (documents > 0) held[word.from] = documents;
  }
  return held;
}

/// An index knows its own words alone: where it has repaired one that others hold, it is asked again, and told so. What
/// others hold is counted for the same asker.
void AskAgainForHeldWords(std::vector<AskedIndex>& indices, const SearchRequest& request,
                          std::vector<IndexReply>& replies, const LeaveOutFunction& leave_out) {
  std::vector<std::optional<SearchReply>> again(replies.size());
  for (size_t i = 0; i < replies.size(); ++i) {
    SearchRequest told = request;
    told.elsewhere = HeldElsewhere(replies, replies[i]);
    if (told.elsewhere.empty()) continue;
    again[i] = Ask(indices[replies[i].index], std::move(told), leave_out).value_or(SearchReply());
  }
  for (size_t i = 0; i < replies.size(); ++i) {
    if (again[i].has_value()) replies[i].reply = std::move(*again[i]);
  }
}

/// Where one index has documents with all words, the others, asked for the same, have none.
void DropPoorSubstitutes(std::vector<IndexReply>& replies) {
  const bool any_has_all = std::any_of(replies.begin(), replies.end(), [](const IndexReply& of) {
    return of.reply.total > 0 && !of.reply.none_has_all;
  });
  for (IndexReply& of : replies) {
    if (any_has_all && of.reply.none_has_all) of.reply = SearchReply();
  }
}

void MergeRepaired(std::vector<RepairedWord>& merged, std::vector<RepairedWord> repaired) {
  for (RepairedWord& word : repaired) {
    const auto same = std::find_if(merged.begin(), merged.end(), [&word](const RepairedWord& other) {
      return other.from == word.from && other.to == word.to;
    });
    if (same == merged.end()) {
      merged.push_back(std::move(word));
    } else {
      same->also = same->also || word.also;
    }
  }
}

/// Takes everything but the hits out of the replies.
MergedReply AddUp(std::vector<IndexReply>& replies) {
  MergedReply merged;
  int64_t total_all = 0;
  bool none_found = true;
  for (IndexReply& of : replies) {
    SearchReply& reply = of.reply;
    merged.total += reply.total;
    total_all += reply.total_all.value_or(reply.total);
    merged.ranking_bounded = merged.ranking_bounded || reply.ranking_bounded;
    merged.none_has_all = merged.none_has_all || reply.none_has_all;
    std::move(reply.suggestions.begin(), reply.suggestions.end(), std::back_inserter(merged.suggestions));
    std::move(reply.hints.begin(), reply.hints.end(), std::back_inserter(merged.hints));
    MergeRepaired(merged.repaired, std::move(reply.repaired));
    MergeRepaired(merged.synonyms, std::move(reply.synonyms));
    if (reply.total == 0) continue;
    if (none_found) merged.ignored = std::move(reply.ignored);
    std::erase_if(merged.ignored, [&](const std::string& word) {
      return !none_found && std::find(reply.ignored.begin(), reply.ignored.end(), word) == reply.ignored.end();
    });
    none_found = false;
  }
  if (total_all != merged.total) merged.total_all = total_all;
  MakeUnique(merged.suggestions);
  MakeUnique(merged.hints);
  return merged;
}

std::vector<IndexHit> HitsOf(IndexReply& of) {
  std::vector<IndexHit> hits;
  hits.reserve(of.reply.hits.size());
  for (SearchHit& hit : of.reply.hits) hits.push_back({of.index, std::move(hit)});
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
  std::vector<IndexReply> replies = AskAll(indices, each, leave_out);
  if (merges) AskAgainForHeldWords(indices, each, replies, leave_out);
  DropPoorSubstitutes(replies);
  MergedReply merged = AddUp(replies);
  if (!request.explain) std::erase_if(merged.synonyms, [](const RepairedWord& word) { return word.also; });
  std::vector<std::vector<IndexHit>> of_index;
  of_index.reserve(replies.size());
  for (IndexReply& of : replies) of_index.push_back(HitsOf(of));
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
