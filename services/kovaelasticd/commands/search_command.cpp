#include <algorithm>
#include <chrono>
#include <iterator>
#include <tuple>
#include <utility>

#include "common/clock.h"
#include "common/error.h"
#include "common/json_util.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/query/query.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

namespace {

/// Hits in one reply.
constexpr int64_t kLimitMax = 1000;
/// The last hit that can be reached by paging: all before it have to be ordered for it.
constexpr int64_t kLastHitMax = 100000;
constexpr size_t kMarkMaxBytes = 64;

/// A hit and the index that it is from.
struct IndexHit {
  std::string index_id;
  SearchHit hit;
};

[[noreturn]] void Refuse(const std::string& sentence) { throw Error(Error::kEngineBadRequest, sentence); }

SortKey ReadSort(const Json::Value& data) {
  const std::string name = OptionalText(data, "sort").value_or("relevance");
  if (name == "relevance") return SortKey::kRelevance;
  if (name == "date") return SortKey::kDate;
  if (name == "name") return SortKey::kName;
  if (name == "size") return SortKey::kSize;
  Refuse("\"sort\" must be relevance, date, name or size");
}

bool ReadAscending(const Json::Value& data, SortKey sort) {
  const std::string order = OptionalText(data, "order").value_or(sort == SortKey::kName ? "asc" : "desc");
  if (order != "asc" && order != "desc") Refuse("\"order\" must be asc or desc");
  return order == "asc";
}

std::string ReadMark(const Json::Value& data, const char* name, const char* otherwise) {
  const std::string mark = OptionalText(data, name).value_or(otherwise);
  if (mark.size() > kMarkMaxBytes) Refuse("\"" + std::string(name) + "\" must be a text of at most 64 bytes");
  return mark;
}

/// The request's members but the query and the indices. The default order is the best, newest or largest first, and
/// names from A to Z.
SearchRequest ReadSearch(const Json::Value& data) {
  SearchRequest request;
  request.offset = OptionalInt(data, "offset", 0, 0, kLastHitMax);
  request.limit = OptionalInt(data, "limit", 20, 0, kLimitMax);
  if (request.offset + request.limit > kLastHitMax) {
    Refuse("only the first " + std::to_string(kLastHitMax) + " hits can be shown; narrow the query");
  }
  request.sort = ReadSort(data);
  request.ascending = ReadAscending(data, request.sort);
  request.snippet = OptionalBool(data, "snippet", true);
  request.mark_start = ReadMark(data, "mark_start", "[");
  request.mark_end = ReadMark(data, "mark_end", "]");
  return request;
}

/// The indices that are asked: one ("id"), several ("ids"), or all that there are.
struct AskedIndices {
  std::vector<Registry::OpenIndex> open;
  std::string required;  ///< the one that the whole search fails without
  Json::Value left_out{Json::arrayValue};
};

void AddLeftOut(AskedIndices& asked, const std::string& id, int code, const std::string& reason, bool searched) {
  Json::Value entry;
  entry["id"] = id;
  entry["code"] = code;
  entry["reason"] = reason;
  entry["searched"] = searched;
  asked.left_out.append(std::move(entry));
}

/// Notes the index among those that were not searched, so that nobody takes what was found for all that there is. What
/// is wrong with the request itself fails it.
void LeaveOut(AskedIndices& asked, const std::string& id, const Error& error) {
  if (id == asked.required || error.Code() == Error::kEngineBadRequest) throw Error(error);
  AddLeftOut(asked, id, error.Code(), error.what(), false);
}

/// Opens the indices that the request names. One that cannot be opened is left out, and said so in the reply.
AskedIndices ReadIndices(CommandCall& call) {
  AskedIndices asked;
  std::vector<std::string> ids;
  const Json::Value& named = call.data["ids"];
  if (call.data.isMember("id")) ids.push_back(asked.required = RequiredText(call.data, "id"));
  if (!IsJsonArray(named)) Refuse("\"ids\" must be an array of index ids");
  for (const Json::Value& id : named) {
    if (!id.isString()) Refuse("\"ids\" must be an array of index ids");
    ids.push_back(id.asString());
  }
  if (ids.empty() && !named.isArray()) {
    for (const Registry::Listed& listed : call.registry.List()) ids.push_back(listed.id);
  }
  asked.open.reserve(ids.size());
  for (const std::string& id : ids) {
    try {
      asked.open.push_back(call.registry.Open(id));
    } catch (const Error& error) {
      LeaveOut(asked, id, error);
    }
  }
  return asked;
}

/// Whether `a` comes before `b` in the reply.
bool ComesFirst(const SearchRequest& request, const IndexHit& a, const IndexHit& b) {
  const SearchHit& first = request.ascending ? a.hit : b.hit;
  const SearchHit& second = request.ascending ? b.hit : a.hit;
  if (request.sort == SortKey::kRelevance) return first.score < second.score;
  if (request.sort == SortKey::kName) return CompareNames(first.name_key, second.name_key) < 0;
  return first.number_key < second.number_key;
}

/// A hit as the reply has it; takes the fields out of `found`.
Json::Value HitJson(IndexHit& found) {
  Json::Value hit;
  hit["id"] = found.index_id;
  hit["doc_id"] = found.hit.path;
  hit["score"] = found.hit.score;
  if (!found.hit.snippet.empty()) hit["snippet"] = found.hit.snippet;
  hit["fields"] = std::move(found.hit.fields);
  return hit;
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

/// The page of a search over several indices: the best of each, merged.
std::vector<IndexHit> SearchAll(AskedIndices& asked, const SearchRequest& request, SearchReply& sums) {
  const bool merges = asked.open.size() > 1;
  SearchRequest each = request;
  if (merges) {
    each.offset = 0;
    each.limit = request.offset + request.limit;
  }
  std::vector<std::vector<IndexHit>> of_index;
  for (const Registry::OpenIndex& open : asked.open) {
    try {
      SearchReply reply = open.index->Search(each);
      sums.total += reply.total;
      sums.ranking_bounded = sums.ranking_bounded || reply.ranking_bounded;
      std::vector<IndexHit>& hits = of_index.emplace_back();
      for (SearchHit& hit : reply.hits) hits.push_back({open.id, std::move(hit)});
      for (std::string& word : reply.suggestions) sums.suggestions.push_back(std::move(word));
      if (open.rebuild.Since() == 0) continue;
      AddLeftOut(asked, open.id, Error::kEngineIndexRebuilding, "it is being rebuilt, because " + open.rebuild.Reason(),
                 true);
    } catch (const Error& error) {
      LeaveOut(asked, open.id, error);
    }
  }
  if (!merges) return of_index.empty() ? std::vector<IndexHit>() : std::move(of_index.front());
  std::vector<IndexHit> hits = Merge(std::move(of_index), request, static_cast<size_t>(each.limit));
  hits.erase(hits.begin(), hits.begin() + std::min<ptrdiff_t>(request.offset, std::ssize(hits)));
  return hits;
}

}  // namespace

Json::Value RunSearch(CommandCall& call) {
  const auto began = std::chrono::steady_clock::now();
  SearchRequest request = ReadSearch(call.data);
  const QueryNode query = ParseQuery(RequiredText(call.data, "query"), Clock::Get().Now());
  request.query = &query;
  SearchReply sums;
  AskedIndices asked = ReadIndices(call);
  std::vector<IndexHit> hits = SearchAll(asked, request, sums);
  Json::Value result;
  result["total"] = Json::Int64(sums.total);
  result["ranking_bounded"] = sums.ranking_bounded;
  result["hits"] = Json::Value(Json::arrayValue);
  for (IndexHit& hit : hits) result["hits"].append(HitJson(hit));
  result["left_out"] = std::move(asked.left_out);
  if (sums.total == 0 && !sums.suggestions.empty()) {
    result["suggestions"] = Json::Value(Json::arrayValue);
    std::sort(sums.suggestions.begin(), sums.suggestions.end());
    sums.suggestions.erase(std::unique(sums.suggestions.begin(), sums.suggestions.end()), sums.suggestions.end());
    for (const std::string& word : sums.suggestions) result["suggestions"].append(word);
  }
  const auto took = std::chrono::steady_clock::now() - began;
  result["took_us"] = Json::Int64(std::chrono::duration_cast<std::chrono::microseconds>(took).count());
  return result;
}

}  // namespace ferrox::engine
