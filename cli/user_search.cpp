#include <algorithm>
#include <cstdio>

#include "cli/as_user.h"
#include "cli/ask.h"
#include "cli/did_you_mean.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "cli/hits.h"
#include "cli/output.h"
#include "cli/user_commands.h"
#include "common/error.h"
#include "wire/engine_requests.h"

/// Searching by ordinary users: which shares there are for them, whether they are up to date and what is missing from
/// an answer, all that the engine says.
namespace ferrox::cli {

namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

constexpr seconds kLongestAnswer(20);  ///< somebody waits at a terminal
constexpr seconds kFreshMax(60);       ///< the engine waits no longer for users
constexpr seconds kSlack(5);           ///< of the engine, when it waits itself

constexpr char kNotAllNoticed[] =
    "part of the service does not run, so recent changes may be missing; its administrator can start it with "
    "'fileindexctl up'";
constexpr char kMayBeBehind[] = "its latest changes may not be indexed yet";

bool Contains(const std::vector<std::string>& names, const std::string& name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

/// Those that the user may enter: who calls, or whom `as` names.
std::vector<std::string> AllShares(const Json::Value& as) {
  Json::Value data(Json::objectValue);
  if (!as.isNull()) data["as"] = as;
  std::vector<std::string> names;
  for (const Json::Value& share : AskEngine(wire::EngineRequest("shares", data), kLongestAnswer)) {
    names.push_back(TextOf(share, "share"));
  }
  return names;
}

Json::Value NamesAsJson(const std::vector<std::string>& names) {
  Json::Value json(Json::arrayValue);
  for (const std::string& name : names) json.append(name);
  return json;
}

/// Waits until all that was changed before can be found. @return the shares of which that cannot be said.
std::vector<std::string> AwaitFresh(const std::vector<std::string>& shares, const Json::Value& as, seconds longest) {
  longest = std::min(longest, kFreshMax);
  Json::Value data(Json::objectValue);
  if (!shares.empty()) data["shares"] = NamesAsJson(shares);
  if (!as.isNull()) data["as"] = as;
  data["timeout_ms"] = Json::Int64(milliseconds(longest).count());
  std::vector<std::string> behind;
  const Json::Value reply = AskEngine(wire::EngineRequest("fresh", data), longest + kSlack);
  for (const Json::Value& share : reply["behind"]) behind.push_back(share.asString());
  return behind;
}

/// Takes the shares that are behind out of `shares`, where none means all; what they hold by now may do.
/// @return whether there is anything left to be searched.
bool MakeUserFresh(const Arguments& arguments, const Json::Value& as, std::vector<std::string>& shares, Found& found) {
  const std::vector<std::string> behind = AwaitFresh(shares, as, FreshWait(arguments));
  const bool stale_will_do = arguments.Has("--partial");
  found.stale = !behind.empty();
  for (const std::string& share : behind) found.left_out.AddForUser(share, 0, kMayBeBehind, stale_will_do);
  if (stale_will_do || behind.empty()) return true;
  if (shares.empty()) shares = AllShares(as);
  shares.erase(std::remove_if(shares.begin(), shares.end(),
                              [&behind](const std::string& share) { return Contains(behind, share); }),
               shares.end());
  return !shares.empty();
}

/// A share that was asked for alone and cannot be searched now is the engine's error; several are named in its reply.
bool IsLeftOut(int code) {
  return code == Error::kEngineIndexPaused || code == Error::kEngineIndexPreparing || code == Error::kEngineStorage ||
         code == Error::kEngineIndexUpgrading;
}

/// The end of the engine's sentence about a share that does not exist for this user.
std::string ShareMeant(const Refusal& refusal, const std::vector<std::string>& named, const Json::Value& as) try {
  if (refusal.Code() != Error::kEngineNoSuchIndex || named.size() != 1) return "";
  return DidYouMean(named[0], AllShares(as));
} catch (const Failure&) {
  return "";  // what is wrong has been said
}

void SearchShares(Json::Value data, const std::vector<std::string>& shares, Found& found) try {
  if (!shares.empty()) data["shares"] = NamesAsJson(shares);
  const size_t before = found.left_out.Unsearched();
  found.result = Search(data);
  for (const Json::Value& entry : found.result["left_out"]) {
    found.left_out.AddForUser(TextOf(entry, "share"), static_cast<int>(IntOf(entry, "code")), TextOf(entry, "reason"),
                              BoolOf(entry, "searched"));
  }
  found.searched = shares.empty() || found.left_out.Unsearched() - before < shares.size();
  if (found.result["not_noticed"] == true) found.not_noticed = kNotAllNoticed;
} catch (const Refusal& refusal) {
  if (refusal.Code() == Error::kEngineBadRequest) throw UsageError(EscapeForTerminal(refusal.Reason()));
  if (!IsLeftOut(refusal.Code())) throw Failure(refusal.Reason() + ShareMeant(refusal, shares, data["as"]));
  found.left_out.AddForUser(shares.size() == 1 ? shares[0] : "", refusal.Code(), refusal.Reason());
  found.result = NothingSearched();
  found.searched = false;
}

}  // namespace

int RunUserSearch(const Arguments& arguments) {
  Found found;
  Json::Value data = SearchMembers(arguments);
  const Json::Value as = arguments.Has("--as") ? ToJson(UserOf(arguments)) : Json::Value();
  if (!as.isNull()) data["as"] = as;
  std::vector<std::string> shares = arguments.All("--share");
  try {
    found.searched = !arguments.Has("--fresh") || MakeUserFresh(arguments, as, shares, found);
  } catch (const Failure& failure) {
    const bool goes_on = arguments.Has("--partial");
    Warn(failure.what());
    (void)fprintf(stderr, "%s\n", goes_on ? "Shown is what has been indexed so far." : kWithoutFresh);
    if (!goes_on) return kIncomplete;
  }
  if (found.searched) {
    SearchShares(std::move(data), shares, found);
  } else {
    found.result = NothingSearched();
  }
  return PrintFound(arguments, std::move(found));
}

}  // namespace ferrox::cli
