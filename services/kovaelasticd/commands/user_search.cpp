#include "services/kovaelasticd/commands/user_search.h"

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "services/kovaelasticd/commands/live_page.h"
#include "services/kovaelasticd/commands/search_answer.h"
#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

namespace {

/// What fields that may be shown begin with.
constexpr char kShownPrefix[] = "KOVAMD";

/// The indices of the shares that are searched, and what is said of the others.
struct UserScope {
  std::vector<AskedIndex> indices;
  bool one_named = false;  ///< the whole search fails with its one share
  Json::Value left_out{Json::arrayValue};
};

void AddLeftOutShare(UserScope& scope, const std::string& share, const Error& error, bool searched) {
  Json::Value entry;
  entry["share"] = share;
  entry["code"] = error.Code();
  entry["reason"] = SentenceForUsers(error);
  entry["searched"] = searched;
  scope.left_out.append(std::move(entry));
}

/// Rethrows where it is the one share that was named, or the request is at fault.
void LeaveOutShare(UserScope& scope, const std::string& share, const Error& error) {
  const bool is_of_request = error.Code() == Error::kEngineBadRequest || error.Code() == Error::kEngineUserBusy;
  if (scope.one_named || is_of_request) {
    throw UserError(error.Code(), SentenceForUsers(error));
  }
  AddLeftOutShare(scope, share, error, false);
}

UserScope OpenScope(const CommandCall& call, const Asker& asker) {
  const std::optional<std::vector<std::string>> named = ReadShareNames(call.data);
  UserScope scope;
  scope.one_named = named.has_value() && named->size() == 1;
  for (EnteredShare& share : EnteredShares(call, asker, named)) {
    try {
      scope.indices.push_back({OpenForUser(call, share), std::move(share.asker)});
    } catch (const Error& error) {
      LeaveOutShare(scope, share.note->share, error);
    }
  }
  return scope;
}

/// Takes the fields out of `found`.
Json::Value UserHitJson(const UserScope& scope, IndexHit& found) {
  Json::Value hit = HitForAll(found.hit);
  hit["share"] = scope.indices[found.index].open.share->share;
  hit["fields"] = FieldsForUsers(std::move(found.hit.fields));
  return hit;
}

/// How much of an index that is being upgraded, or given access records, is done, of a hundred; nothing when neither.
/// An upgrade may end in between: what follows it is asked for last.
std::optional<int64_t> PreparedPercent(Index& index) {
  const std::optional<UpgradeProgress> upgrade = index.Upgrading();
  if (upgrade.has_value()) return upgrade->of == 0 ? 0 : upgrade->done * 100 / upgrade->of;
  return index.PreparingPercent();
}

}  // namespace

Json::Value FieldsForUsers(Json::Value fields) {
  for (const std::string& name : fields.getMemberNames()) {
    if (!name.starts_with(kShownPrefix)) fields.removeMember(name);
  }
  return fields;
}

Registry::OpenIndex OpenForUser(const CommandCall& call, const EnteredShare& share) {
  if (!share.note->refused.empty()) throw UserError(Error::kEngineNotPermitted, share.note->refused);
  if (share.paused) throw Error(Error::kEngineIndexPaused);
  Registry::OpenIndex open = call.registry.Open(share.index_id);
  // Between the list and now, the index may have become another share's.
  if (open.share == nullptr || !(*open.share == *share.note)) RefuseShare(share.note->share);
  if (const std::optional<int64_t> percent = PreparedPercent(*open.index); percent.has_value()) {
    throw UserError(Error::kEngineIndexPreparing,
                    "the index of this share is being prepared, " + std::to_string(*percent) + " %");
  }
  return open;
}

Json::Value SearchForUser(const CommandCall& call, const Asker& asker, const SearchRequest& request,
                          AskedQuery& query) {
  if (call.data.isMember("id") || call.data.isMember("ids")) {
    throw UserError(Error::kEngineNotPermitted, "ordinary users name \"shares\", not indices");
  }
  UserScope scope = OpenScope(call, asker);
  ResolveSharePaths(query, scope.indices);
  LivePage page = SearchLivePage(
      scope.indices, request, call.look,
      [&scope](const AskedIndex& index, const Error& error) { LeaveOutShare(scope, index.open.share->share, error); });
  for (const AskedIndex& index : scope.indices) {
    if (index.failed || index.open.rebuild.Since() == 0) continue;
    AddLeftOutShare(scope, index.open.share->share, Error(Error::kEngineIndexRebuilding), true);
  }
  Json::Value result;
  AddTotalsAndWords(result, page.found, query.hints);
  result["next_offset"] = Json::Int64(page.next_offset);
  result["hits"] = Json::Value(Json::arrayValue);
  for (IndexHit& hit : page.found.hits) result["hits"].append(UserHitJson(scope, hit));
  result["left_out"] = std::move(scope.left_out);
  return result;
}

}  // namespace ferrox::engine
