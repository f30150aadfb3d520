#include "wire/await_changes.h"

#include <algorithm>
#include <utility>

#include "common/error.h"
#include "common/paths.h"

namespace ferrox::wire {

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

/// How much later than it was told to a daemon may answer.
constexpr milliseconds kSyncSlack(5000);

Reply Sync(const char* socket, Json::Value data, milliseconds longest) {
  data["timeout_ms"] = Json::Int64(longest.count());
  return AskDaemon(socket, "sync", data, longest + kSyncSlack);
}

Reply SyncShares(const std::vector<std::string>& shares, milliseconds longest) {
  Json::Value data(Json::objectValue);
  for (const std::string& share : shares) data["shares"].append(share);
  return Sync(kFileIndexdSocket, std::move(data), longest);
}

/// Whether the index daemon says that changes are missing, rather than nothing at all.
bool SaysBehind(const Reply& reply) {
  return reply.outcome == Outcome::kRefused && reply.code != Error::kEngineNotPermitted;
}

std::string ReasonOf(const Reply& reply, const std::string& share) {
  const std::string reason = reply.message.empty() ? "the request failed" : reply.message;
  const std::string name = "share " + share + ": ";
  return reason.starts_with(name) ? reason.substr(name.size()) : reason;
}

}  // namespace

/// Only where it cannot be said of all shares together, each is asked for by itself.
ChangesReport AwaitChanges(const std::vector<std::string>& shares, milliseconds longest,
                           milliseconds longest_indexing) {
  auto end = steady_clock::now() + longest;
  const auto left = [&end] {
    return std::max(std::chrono::duration_cast<milliseconds>(end - steady_clock::now()), milliseconds(0));
  };
  Reply noticed = Sync(kNotifydSocket, Json::Value(Json::objectValue), longest);
  if (noticed.outcome != Outcome::kAnswered) return {kNotifydSocket, std::move(noticed)};
  ChangesReport report;
  for (const Json::Value& problem : noticed.data["problems"])
    report.not_noticed += (report.not_noticed.empty() ? "" : "; ") + problem.asString();
  if (!report.not_noticed.empty()) return report;
  end = std::min(end, steady_clock::now() + longest_indexing);
  Reply all = SyncShares(shares, left());
  if (all.outcome == Outcome::kAnswered) return report;
  if (!SaysBehind(all) || shares.empty()) return {kFileIndexdSocket, std::move(all)};
  for (const std::string& share : shares) {
    Reply one = shares.size() == 1 ? all : SyncShares({share}, left());
    if (one.outcome == Outcome::kAnswered) continue;
    if (!SaysBehind(one)) return {kFileIndexdSocket, std::move(one)};
    report.behind[share] = ReasonOf(one, share);
  }
  return report;
}

}  // namespace ferrox::wire
