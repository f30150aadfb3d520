#include <algorithm>
#include <cstdio>
#include <set>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "cli/hits.h"
#include "cli/output.h"
#include "cli/user_commands.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "sdk/share.h"

/// Searching by root and by the owner of the instance. The engine answers for the indices that it is given; which those
/// are, whether they are up to date, and what is missing from the answer is worked out here, so that an answer that is
/// not complete never looks complete.
namespace ferrox::cli {

namespace {

/// What a search is about: the shares that were named, else all of which a folder is indexed. What an engine keeps
/// besides is of nobody any more.
struct Scope {
  std::vector<std::string> shares;
  bool known = true;  ///< false: the list of folders cannot be read, so that all that the engine has are searched
};

/// @throws Error kNoSuchShare for a --share that is not there. A list of folders that is damaged keeps nobody from
/// searching.
Scope ReadScope(const Arguments& arguments, Found& found) {
  Scope scope;
  for (const std::string& share : arguments.All("--share")) {
    const std::string name = sdk::SDKShare(share).GetName();
    if (std::find(scope.shares.begin(), scope.shares.end(), name) == scope.shares.end()) scope.shares.push_back(name);
  }
  if (!scope.shares.empty()) return scope;
  try {
    const std::set<std::string> indexed = fileindex::FolderMgr().GetIndexedShares();
    scope.shares.assign(indexed.begin(), indexed.end());
  } catch (const Error& error) {
    scope.known = false;
    found.left_out.Add("", error.Code(), "which shares have no index is not known: " + Explain(error));
  }
  return scope;
}

Json::Value SearchRequest(const Arguments& arguments, const Scope& scope) {
  Json::Value data = SearchMembers(arguments);
  if (scope.known) data["ids"] = Json::Value(Json::arrayValue);
  for (const std::string& share : scope.shares) data["ids"].append(fileindex::elastic::GetFileIndexID(share));
  return data;
}

/// Waits until the indices hold all that was changed before. Shares of which that cannot be said leave the search,
/// unless what they hold by now will do.
void MakeFresh(const Arguments& arguments, Scope& scope, Found& found) {
  const bool stale_will_do = arguments.Has("--partial");
  for (const auto& [share, reason] : AwaitChanges(scope.shares, FreshWait(arguments))) {
    found.stale = true;
    found.left_out.Add(share, 0, reason, stale_will_do);
    if (!stale_will_do) scope.shares.erase(std::find(scope.shares.begin(), scope.shares.end(), share));
  }
}

/// Whether there is anything left to be searched.
bool IsFresh(const Arguments& arguments, Scope& scope, Found& found) try {
  MakeFresh(arguments, scope, found);
  return true;
} catch (const Failure& failure) {
  const bool goes_on = arguments.Has("--partial");
  Warn(failure.what());
  (void)fprintf(stderr, "%s\n", goes_on ? "Shown is what has been indexed so far." : kWithoutFresh);
  return goes_on;
}

/// A query that cannot be understood is wrong usage, not a failure of the engine.
Json::Value Ask(const Json::Value& request) try { return Search(request); } catch (const Refusal& refusal) {
  if (refusal.Code() != Error::kEngineBadRequest) throw;
  throw UsageError(EscapeForTerminal(refusal.Reason()));  // the words themselves cannot be understood
}

/// The engine's answer, also where no share is left to ask it about.
void SearchIn(const Arguments& arguments, const Scope& scope, Found& found) {
  found.searched = !scope.known || !scope.shares.empty() || found.left_out.Empty();
  if (!found.searched) {
    found.result = NothingSearched();
    return;
  }
  found.result = Ask(SearchRequest(arguments, scope));
  // Shares that --fresh has left out before are not among those that the engine was asked about.
  const size_t before = found.left_out.Unsearched();
  found.left_out.AddFrom(found.result["left_out"]);
  found.searched = scope.shares.empty() || found.left_out.Unsearched() - before < scope.shares.size();
}

}  // namespace

int RunSearch(const Arguments& arguments) {
  if (arguments.Has("--as")) return RunUserSearch(arguments);
  Found found;
  Scope scope = ReadScope(arguments, found);
  (void)SearchMembers(arguments);  // wrong usage is found before anything waits
  if (arguments.Has("--fresh") && !IsFresh(arguments, scope, found)) return kIncomplete;
  SearchIn(arguments, scope, found);
  found.not_noticed = NotNoticed();
  const int code = PrintFound(arguments, std::move(found));
  if (scope.known && scope.shares.empty())
    Warn("no folder is indexed yet; 'fileindexctl share add FOLDER' indexes one");
  return code;
}

}  // namespace ferrox::cli
