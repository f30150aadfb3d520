#include <algorithm>
#include <chrono>
#include <iterator>
#include <memory>
#include <optional>
#include <utility>

#include "common/clock.h"
#include "common/error.h"
#include "services/kovaelasticd/commands/asked_ids.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/entered_shares.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/merged_search.h"
#include "services/kovaelasticd/commands/search_answer.h"
#include "services/kovaelasticd/commands/search_request.h"
#include "services/kovaelasticd/commands/share_paths.h"
#include "services/kovaelasticd/commands/user_search.h"
#include "services/kovaelasticd/query/query.h"

namespace ferrox::engine {

namespace {

/// The indices that are asked: one ("id"), several ("ids"), those of "shares", or all that there are.
struct AskedIndices {
  std::vector<AskedIndex> open;
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
AskedIndices OpenAsked(const CommandCall& call) {
  AskedIndices asked;
  const std::vector<std::string> ids = AskedIds(call, asked.required);
  asked.open.reserve(ids.size());
  for (const std::string& id : ids) {
    try {
      asked.open.push_back({call.registry.Open(id)});
    } catch (const Error& error) {
      LeaveOut(asked, id, error);
    }
  }
  return asked;
}

/// A hit as the reply has it; takes the fields out of `found`.
Json::Value HitJson(const AskedIndices& asked, IndexHit& found) {
  Json::Value hit = HitForAll(found.hit);
  hit["id"] = asked.open[found.index].open.id;
  hit["fields"] = std::move(found.hit.fields);
  return hit;
}

/// For those who see everything.
Json::Value SearchEverything(const CommandCall& call, const SearchRequest& request, AskedQuery& query) {
  const auto began = std::chrono::steady_clock::now();
  AskedIndices asked = OpenAsked(call);
  ResolveSharePaths(query, asked.open);
  MergedReply found = SearchIndices(asked.open, request, [&asked](const AskedIndex& index, const Error& error) {
    LeaveOut(asked, index.open.id, error);
  });
  for (const AskedIndex& index : asked.open) {
    if (index.failed || index.open.rebuild.Since() == 0) continue;
    AddLeftOut(asked, index.open.id, Error::kEngineIndexRebuilding,
               "it is being rebuilt, because " + index.open.rebuild.Reason(), true);
  }
  Json::Value result;
  AddTotalsAndWords(result, found, query.hints);
  result["ranking_bounded"] = found.ranking_bounded;
  result["next_offset"] = Json::Int64(request.offset + std::ssize(found.hits));
  result["hits"] = Json::Value(Json::arrayValue);
  for (IndexHit& hit : found.hits) result["hits"].append(HitJson(asked, hit));
  result["left_out"] = std::move(asked.left_out);
  const auto took = std::chrono::steady_clock::now() - began;
  result["took_us"] = Json::Int64(std::chrono::duration_cast<std::chrono::microseconds>(took).count());
  return result;
}

/// Whether the query has words that documents are ranked by.
bool HasWords(const QueryNode& query) {
  if (query.type == QueryNode::Type::kNot) return false;
  return query.type == QueryNode::Type::kText || query.type == QueryNode::Type::kField ||
         query.type == QueryNode::Type::kName || std::any_of(query.children.begin(), query.children.end(), &HasWords);
}

}  // namespace

Json::Value RunSearch(CommandCall& call) {
  SearchRequest request = ReadSearch(call.data);
  AskedQuery query;
  query.tree = ParseQuery(RequiredText(call.data, "query"), Clock::Get().Now(), &query.hints);
  request.query = &query.tree;
  if (request.sort == SortKey::kRelevance && !HasWords(query.tree)) request.sort = SortKey::kDate;
  const std::shared_ptr<const Synonyms> synonyms = call.synonyms();
  request.synonyms = synonyms.get();
  const std::optional<Asker> asker = AskerOf(call.caller, call.data, call.named);
  Json::Value result =
      asker.has_value() ? SearchForUser(call, *asker, request, query) : SearchEverything(call, request, query);
  if (OptionalBool(call.data, "tell_fields", false)) AddFieldsAskedFor(result, query.tree);
  return result;
}

}  // namespace ferrox::engine
