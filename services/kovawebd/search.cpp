#include "services/kovawebd/search.h"

#include <algorithm>
#include <chrono>
#include <string>
#include <utility>

#include "common/json_util.h"
#include "services/kovawebd/engine.h"

namespace ferrox::web {

namespace {

/// The most hits that the engine gives at once.
constexpr int64_t kPageMax = 1000;
constexpr int64_t kLimitDefault = 20;
constexpr int64_t kCompletionsDefault = 10;
/// What the fields begin with that are for everybody, and the ids of indices that are shares'.
constexpr char kShownFields[] = "KOVAMD";
constexpr char kIndexOfShare[] = "fileindex_";

void AddShares(const Call& call, Json::Value& data) {
  const auto found = call.parameters.find("share");
  if (found != call.parameters.end()) data["shares"] = Vec2JsonArr(found->second);
}

/// The same wherever it comes from: to the owner of an instance of its own the engine tells more, by other names.
Json::Value HitForApi(Json::Value hit) {
  hit["path"] = hit["doc_id"];
  hit.removeMember("doc_id");
  if (hit["id"].isString() && hit["id"].asString().starts_with(kIndexOfShare)) {
    hit["share"] = hit["id"].asString().substr(sizeof(kIndexOfShare) - 1);
  }
  hit.removeMember("id");
  Json::Value& fields = hit["fields"];
  for (const std::string& name : fields.getMemberNames()) {
    if (!name.starts_with(kShownFields)) fields.removeMember(name);
  }
  return hit;
}

/// @throws Problem 504 when it cannot be said in time that all is in, for whatever reason.
void AwaitFresh(const Call& call) {
  constexpr std::chrono::seconds kSlack(5);
  const std::chrono::seconds longest(call.Number("fresh", 0));
  Json::Value data(Json::objectValue);
  AddShares(call, data);
  data["timeout_ms"] = Json::Int64(std::chrono::milliseconds(longest).count());
  Json::Value reply;
  try {
    reply = AskEngineFor(call.who, "fresh", std::move(data), longest + kSlack);
  } catch (const Problem& problem) {
    if (problem.status < 500) throw;
    throw Problem{504, problem.detail};
  }
  if (reply["behind"].empty()) return;
  std::string shares;
  for (const std::string& share : JsonArr2Vec<std::string>(reply["behind"])) {
    shares += (shares.empty() ? "" : ", ") + share;
  }
  throw Problem{504, "what was changed before cannot all be found yet, in: " + shares};
}

/// Whether there are hits behind those of this page, which begins at `offset`.
bool HasMore(const Json::Value& page, int64_t offset) {
  return page["next_offset"].asInt64() > offset && offset + int64_t{page["hits"].size()} < page["total"].asInt64();
}

Json::Value SearchData(const Call& call) {
  Json::Value data(Json::objectValue);
  data["query"] = call.Text("q");
  data["sort"] = call.Text("sort", "relevance");
  if (call.Has("order")) data["order"] = call.Text("order");
  if (call.Yes("all_words")) data["all_words"] = true;
  AddShares(call, data);
  return data;
}

}  // namespace

Json::Value Search(const Call& call) {
  if (call.Has("fresh")) AwaitFresh(call);
  Json::Value data = SearchData(call);
  int64_t offset = call.Number("cursor", 0);
  int64_t left = call.Number("limit", kLimitDefault);
  Json::Value answer, hits(Json::arrayValue);
  bool more = true;
  for (bool first = true; first || (more && left > 0); first = false) {
    data["offset"] = Json::Int64(offset);
    data["limit"] = Json::Int64(std::min(left, kPageMax));
    Json::Value page = AskEngineFor(call.who, "search", data);
    for (Json::Value& hit : page["hits"]) hits.append(HitForApi(std::move(hit)));
    more = HasMore(page, offset);
    left -= std::max<int64_t>(page["hits"].size(), 1);
    offset = page["next_offset"].asInt64();
    answer = std::move(page);
  }
  for (const char* name : {"next_offset", "took_us", "ranking_bounded"}) answer.removeMember(name);
  answer["hits"] = std::move(hits);
  if (more) answer["cursor"] = std::to_string(offset);
  return answer;
}

Json::Value Complete(const Call& call) {
  Json::Value data(Json::objectValue);
  data["text"] = call.Text("q");
  data["limit"] = Json::Int64(call.Number("limit", kCompletionsDefault));
  AddShares(call, data);
  return AskEngineFor(call.who, "complete", std::move(data));
}

Json::Value ShowFile(const Call& call) {
  Json::Value data(Json::objectValue);
  data["path"] = call.Text("path");
  data["text"] = call.Yes("text");
  return AskEngineFor(call.who, "show", std::move(data));
}

Json::Value ListShares(const Call& call) {
  Json::Value answer;
  answer["shares"] = AskEngineFor(call.who, "shares", Json::Value(Json::objectValue));
  return answer;
}

}  // namespace ferrox::web
