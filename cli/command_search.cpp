#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <set>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/escape.h"
#include "cli/explain.h"
#include "cli/format.h"
#include "cli/left_out.h"
#include "cli/output.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "wire/fields.h"

/// Searching. The engine answers for the indices that it is given; which those are, whether they are up to date, and
/// what is missing from the answer is worked out here, so that an answer that is not complete never looks complete.
namespace ferrox::cli {

namespace {

namespace field = fileindex::elastic;

/// Hits that one call shows: what fits on a screen, and the most that may be asked for.
constexpr long long kLimitDefault = 10;
constexpr long long kLimitMax = 1000;
/// How long --fresh waits unless it says otherwise, and at most.
constexpr long long kFreshSeconds = 30;
constexpr long long kFreshSecondsMax = 600;
/// What the engine puts around a match. Not shown: each becomes what the output can show.
constexpr char kMarkStart = '\x02';
constexpr char kMarkEnd = '\x03';
constexpr char kWithoutFresh[] = "Without --fresh, or with --partial, the search shows what is indexed by now.";

/// The query as one text. The shell has taken one pair of quotes away: a phrase is given as '"a phrase"'.
std::string JoinWords(const std::vector<std::string>& words) {
  std::string query;
  for (const std::string& word : words) query += (query.empty() ? "" : " ") + word;
  return query;
}

/// What a search is about: the share that was named, else all of which a folder is indexed. What an engine keeps
/// besides is of nobody any more.
struct Scope {
  std::vector<std::string> shares;
  bool known = true;     ///< false: the list of folders cannot be read, so that all that the engine has are searched
  bool searched = true;  ///< false: none was
  bool stale = false;    ///< some are not known to hold all that was changed before
  LeftOut left_out;
};

/// @throws Error kNoSuchShare for a --share that is not there. A list of folders that is damaged keeps nobody from
/// searching.
Scope ReadScope(const Arguments& arguments) {
  Scope scope;
  if (arguments.Has("--share")) {
    scope.shares.push_back(sdk::SDKShare(arguments.Get("--share")).GetName());
    return scope;
  }
  try {
    const std::set<std::string> indexed = fileindex::FolderMgr().GetIndexedShares();
    scope.shares.assign(indexed.begin(), indexed.end());
  } catch (const Error& error) {
    scope.known = false;
    scope.left_out.Add("", error.Code(), "those without an index are not known: " + Explain(error));
  }
  return scope;
}

/// Checks the options, too, so that wrong usage is found before anything waits. @throws UsageError.
Json::Value SearchRequest(const Arguments& arguments, const Scope& scope) {
  Json::Value data;
  data["query"] = JoinWords(arguments.words);
  if (scope.known) data["ids"] = Json::Value(Json::arrayValue);
  for (const std::string& share : scope.shares) data["ids"].append(fileindex::elastic::GetFileIndexID(share));
  data["limit"] = Json::Int64(arguments.Number("--limit", kLimitDefault, 1, kLimitMax));
  data["offset"] = Json::Int64(arguments.Number("--offset", 0, 0, 1000000000));
  data["sort"] = arguments.Get("--sort", "relevance");
  data["snippet"] = true;
  const bool json = arguments.Has("--json");
  data["mark_start"] = json ? "[" : std::string(1, kMarkStart);
  data["mark_end"] = json ? "]" : std::string(1, kMarkEnd);
  return data;
}

/// In one word. What is no folder goes by its extension, as it does for the choice of what is read.
std::string KindOf(const Json::Value& fields, const std::string& path) {
  constexpr const char* kKinds[] = {"document", "audio", "video", "image", "other"};
  if (BoolOf(fields, field::kKOVAMDIsDir)) return "folder";
  return kKinds[fileindex::GetFileTypeByFullPath(path)];
}

/// A part of the text with the matches shown: bold on a terminal, in brackets elsewhere. The text comes from files and
/// is escaped between the marks, so that no file can draw on the terminal.
std::string ShowSnippet(const std::string& snippet, bool on_terminal) {
  std::string shown;
  std::string part;
  for (const char byte : snippet + kMarkEnd) {
    if (byte != kMarkStart && byte != kMarkEnd) {
      part += byte;
      continue;
    }
    shown += EscapeOneLine(part);
    part.clear();
    if (byte == kMarkStart) {
      shown += on_terminal ? "\033[1m" : "[";
    } else {
      shown += on_terminal ? "\033[0m" : "]";
    }
  }
  const size_t end = on_terminal ? 4 : 1;  // the mark that closed the last part
  return shown.substr(0, shown.size() - end);
}

/// The path, what matched in the text, and a line of facts.
void PrintHit(const Json::Value& hit, bool on_terminal) {
  const Json::Value& fields = hit["fields"];
  const std::string path = TextOf(hit, "doc_id");
  const std::string shown = EscapeForTerminal(path);
  (void)printf("%s\n", on_terminal ? ("\033[36m" + shown + "\033[0m").c_str() : shown.c_str());
  const std::string snippet = TextOf(hit, "snippet");
  if (!snippet.empty()) (void)printf("    %s\n", ShowSnippet(snippet, on_terminal).c_str());
  (void)printf("    %s, %s, %s\n", KindOf(fields, path).c_str(), Size(IntOf(fields, field::kKOVAMDFSSize)).c_str(),
               Date(IntOf(fields, field::kKOVAMDFSContentChangeDate)).c_str());
}

/// How many were found, which of them are shown, and how long the engine took.
void PrintSummary(const Json::Value& result, uint64_t offset) {
  const uint64_t total = UintOf(result, "total");
  const auto shown = static_cast<uint64_t>(result["hits"].size());
  const double milliseconds = static_cast<double>(UintOf(result, "took_us")) / 1000;
  (void)printf("%s found", Count(total).c_str());
  if (shown < total) (void)printf(", %s to %s shown", Count(offset + 1).c_str(), Count(offset + shown).c_str());
  (void)printf(", %.1f ms%s\n", milliseconds,
               result["ranking_bounded"].asBool() ? "; so many match that only a part was ranked" : "");
}

/// On standard error, with words of the index that are spelt alike.
void PrintNothingFound(const Json::Value& result, const Scope& scope) {
  if (!scope.searched) return;
  std::string similar;
  for (const Json::Value& word : result["suggestions"]) {
    if (word.isString()) similar += (similar.empty() ? "; there is: " : ", ") + EscapeForTerminal(word.asString());
  }
  (void)fprintf(stderr, "%s%s\n", scope.left_out.Empty() ? "nothing found" : "no hit in what was searched",
                similar.c_str());
}

/// Waits until the indices hold all that was changed before. Shares of which that cannot be said leave the search,
/// unless what they hold by now will do.
void MakeFresh(const Arguments& arguments, Scope& scope) {
  const bool given = !arguments.Get("--fresh").empty();
  const auto longest =
      std::chrono::seconds(given ? arguments.Number("--fresh", 0, 0, kFreshSecondsMax) : kFreshSeconds);
  const bool stale_will_do = arguments.Has("--partial");
  for (const auto& [share, reason] : AwaitChanges(scope.shares, longest)) {
    scope.stale = true;
    scope.left_out.Add(share, 0, reason, stale_will_do);
    if (!stale_will_do) scope.shares.erase(std::find(scope.shares.begin(), scope.shares.end(), share));
  }
}

/// Whether there is anything left to be searched.
bool IsFresh(const Arguments& arguments, Scope& scope) try {
  MakeFresh(arguments, scope);
  return true;
} catch (const Failure& failure) {
  const bool goes_on = arguments.Has("--partial");
  Warn(failure.what());
  (void)fprintf(stderr, "%s\n", goes_on ? "What is shown is what is indexed by now." : kWithoutFresh);
  return goes_on;
}

/// A query that cannot be understood is wrong usage, not a failure of the engine.
Json::Value Ask(const Json::Value& request) try { return Search(request); } catch (const Refusal& refusal) {
  if (refusal.Code() != Error::kEngineBadRequest) throw;
  throw UsageError(EscapeForTerminal(refusal.Reason()));  // the words themselves cannot be understood
}

/// The engine's answer, also where no share is left to ask it about.
Json::Value SearchIn(const Arguments& arguments, Scope& scope) {
  if (scope.known && scope.shares.empty() && !scope.left_out.Empty()) {
    Json::Value nothing;
    nothing["total"] = 0;
    nothing["hits"] = Json::Value(Json::arrayValue);
    scope.searched = false;
    return nothing;
  }
  Json::Value result = Ask(SearchRequest(arguments, scope));
  // Shares that --fresh has left out before are not among those that the engine was asked about.
  const size_t before = scope.left_out.Unsearched();
  scope.left_out.AddFrom(result["left_out"]);
  scope.searched = scope.shares.empty() || scope.left_out.Unsearched() - before < scope.shares.size();
  return result;
}

}  // namespace

/// Results on standard output; on standard error what may be missing from them: shares that were left out, daemons that
/// do not run. The exit code says so, too, unless --partial makes do with what there is.
int RunSearch(const Arguments& arguments) {
  Scope scope = ReadScope(arguments);
  const Json::Value request = SearchRequest(arguments, scope);
  if (arguments.Has("--fresh") && !IsFresh(arguments, scope)) return kIncomplete;
  Json::Value result = SearchIn(arguments, scope);
  result["left_out"] = scope.left_out.ToJson();
  const std::string not_noticed = NotNoticed();
  if (!not_noticed.empty()) result["not_noticed"] = not_noticed;
  const uint64_t hits = result["hits"].isArray() ? result["hits"].size() : 0;
  if (arguments.Has("--json")) {
    PrintJson(result);
  } else if (hits > 0) {
    const bool on_terminal = isatty(STDOUT_FILENO) == 1;
    for (const Json::Value& hit : result["hits"]) PrintHit(hit, on_terminal);
    PrintSummary(result, UintOf(request, "offset"));
  } else {
    PrintNothingFound(result, scope);
  }
  (void)fflush(stdout);
  if (!not_noticed.empty()) Warn(not_noticed);
  scope.left_out.Warn();
  const bool partial = arguments.Has("--partial");
  if (scope.stale && !partial) (void)fprintf(stderr, "%s\n", kWithoutFresh);
  if (!scope.left_out.Empty() && !partial) return kIncomplete;
  return hits > 0 ? kDone : kNothingFound;
}

}  // namespace ferrox::cli
