// The commands "fresh" and "shares": what users are told of the daemons' work.
#include <algorithm>
#include <chrono>
#include <initializer_list>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "common/json_util.h"
#include "services/kovaelasticd/commands/commands.h"
#include "services/kovaelasticd/commands/daemon_relay.h"
#include "services/kovaelasticd/commands/entered_shares.h"
#include "services/kovaelasticd/commands/members.h"
#include "services/kovaelasticd/commands/user_error.h"

namespace ferrox::engine {

namespace {

constexpr int kFreshTimeoutMs = 30 * 1000;
constexpr int kFreshTimeoutMaxMs = 600 * 1000;
/// Longer than that no request is kept waiting, whatever it asks for.
constexpr std::chrono::seconds kFreshLongest(60);
constexpr std::chrono::milliseconds kBetweenRounds(100);

/// Those that the asker can enter; for whoever may see everything, all of which the engine knows.
std::vector<EnteredShare> SharesFor(const CommandCall& call) {
  const std::optional<std::vector<std::string>> named = ReadShareNames(call.data);
  const std::optional<Asker> asker = AskerOf(call.caller, call.data, call.named);
  if (asker.has_value()) return EnteredShares(call, *asker, named);
  std::vector<EnteredShare> shares;
  for (const Registry::Listed& index : call.registry.List()) {
    if (index.share == nullptr) continue;
    const bool wanted =
        !named.has_value() || std::find(named->begin(), named->end(), index.share->share) != named->end();
    if (wanted) shares.push_back({index.id, index.share, index.paused, {}});
  }
  if (named.has_value() && shares.size() < named->size()) {
    for (const std::string& name : *named) {
      const auto has_name = [&name](const EnteredShare& share) { return share.note->share == name; };
      if (std::none_of(shares.begin(), shares.end(), has_name)) RefuseShare(name);
    }
  }
  return shares;
}

/// At most 99: what is under way is not complete.
void AddPercent(Json::Value& entry, int64_t done, int64_t of) {
  if (of > 0) entry["percent"] = Json::Int64(std::clamp<int64_t>(done * 100 / of, 0, 99));
}

int64_t FigureIn(const Json::Value& object, const char* name) {
  const Json::Value& figure = object.isObject() ? object[name] : Json::Value::nullSingleton();
  return figure.isInt64() ? figure.asInt64() : 0;
}

/// What the index daemon says of its work on the share; null when it has none.
Json::Value WorkOn(const CommandCall& call, const std::string& share) {
  const Json::Value status = call.relay.IndexingStatus();
  const Json::Value& shares = status.isObject() ? status["shares"] : Json::Value::nullSingleton();
  if (!shares.isArray()) return {};
  for (const Json::Value& work : shares) {
    if (work.isObject() && work["share"] == share) return work;
  }
  return {};
}

bool HasState(const Json::Value& work, std::initializer_list<const char*> states) {
  if (!work.isObject()) return false;
  return std::any_of(states.begin(), states.end(), [&work](const char* state) { return work["state"] == state; });
}

/// Of a share that is being indexed.
void AddIndexingPercent(const Json::Value& work, Json::Value& entry) {
  const Json::Value& comparison = work["comparison"];
  const bool compares = comparison.isObject() && comparison["running"] == true;
  compares ? AddPercent(entry, FigureIn(comparison, "examined"), FigureIn(comparison, "estimate"))
           : AddPercent(entry, FigureIn(work, "operations_done"), FigureIn(work, "operations"));
}

/// What the engine itself knows: the state, with what is to be said of it.
std::string OwnState(const CommandCall& call, const EnteredShare& share, Json::Value& entry) {
  if (!share.note->refused.empty()) {
    entry["reason"] = share.note->refused;
    return "refused";
  }
  try {
    const Registry::OpenIndex open = call.registry.Open(share.index_id);
    if (const auto progress = open.index->Upgrading(); progress.has_value()) {
      AddPercent(entry, progress->done, progress->of);
      return "upgrading";
    }
    if (const std::optional<int> percent = open.index->PreparingPercent(); percent.has_value()) {
      entry["percent"] = *percent;
      return "preparing";
    }
    if (!share.asker.unseen_names.empty() && !open.index->Obeys(share.asker.unseen_names)) return "preparing";
    return open.rebuild.Since() != 0 ? "rebuilding" : "ready";
  } catch (const Error& error) {
    const bool for_user = !call.caller.privileged || !call.data["as"].isNull();
    entry["reason"] = for_user ? SentenceForUsers(error) : error.what();
    return "unavailable";
  }
}

Json::Value StateOf(const CommandCall& call, const EnteredShare& share) {
  Json::Value entry;
  entry["share"] = share.note->share;
  std::string state = OwnState(call, share, entry);
  if (state == "ready" || state == "rebuilding") {
    const Json::Value work = WorkOn(call, share.note->share);
    if (HasState(work, {"indexing"})) {
      AddIndexingPercent(work, entry);
      if (state == "ready") state = "indexing";
    }
  }
  entry["state"] = state;
  return entry;
}

/// Whether waiting may help: the index daemon works on one of the shares.
bool IsAnyWorkedOn(const CommandCall& call, const std::vector<std::string>& shares) {
  return std::any_of(shares.begin(), shares.end(), [&call](const std::string& share) {
    return HasState(WorkOn(call, share), {"starting", "idle", "indexing"});
  });
}

}  // namespace

/// Each round tells of all shares after a short time: those who wait for a share that takes longer wait for another.
Json::Value RunFresh(CommandCall& call) {
  const std::chrono::milliseconds timeout(OptionalInt(call.data, "timeout_ms", kFreshTimeoutMs, 0, kFreshTimeoutMaxMs));
  const auto end = std::chrono::steady_clock::now() + std::min<std::chrono::milliseconds>(timeout, kFreshLongest);
  std::vector<std::string> behind;
  for (const EnteredShare& share : SharesFor(call)) behind.push_back(share.note->share);
  const std::optional<Asker> asker = AskerOf(call.caller, call.data, call.named);
  const uint32_t uid = asker.has_value() ? asker->uid : call.caller.uid;
  while (!behind.empty()) {
    const FreshRounds::Answer answer = call.relay.Fresh().Await(uid, end);
    if (!answer.in_time) break;
    if (!answer.outcome.has_value()) {
      throw UserError(Error::kInternal, "it cannot be said now whether all changes are included");
    }
    std::erase_if(behind, [&answer](const std::string& share) { return answer.outcome->count(share) == 0; });
    if (!IsAnyWorkedOn(call, behind)) break;
    std::this_thread::sleep_for(kBetweenRounds);  // a daemon may say at once that a share is behind
  }
  Json::Value reply;
  reply["behind"] = Vec2JsonArr(behind);
  return reply;
}

Json::Value RunShares(CommandCall& call) {
  Json::Value list(Json::arrayValue);
  for (const EnteredShare& share : SharesFor(call)) list.append(StateOf(call, share));
  return list;
}

}  // namespace ferrox::engine
