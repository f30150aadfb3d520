#include "cli/hits.h"

#include <unistd.h>

#include <cstdio>

#include "cli/escape.h"
#include "cli/format.h"
#include "cli/hit_view.h"
#include "cli/output.h"
#include "cli/search_notes.h"
#include "cli/terminal.h"

namespace ferrox::cli {

namespace {

/// Hits that one call shows: what fits on a screen, and the most that may be asked for.
constexpr long long kLimitDefault = 10;
constexpr long long kLimitMax = 1000;
constexpr long long kOffsetMax = 1000000000;
/// How long --fresh waits unless it says otherwise, and at most.
constexpr long long kFreshSeconds = 30;
constexpr long long kFreshSecondsMax = 600;

/// The query as one text. The shell has taken one pair of quotes away: a phrase is given as '"a phrase"'.
std::string JoinWords(const std::vector<std::string>& words) {
  std::string query;
  for (const std::string& word : words) query += (query.empty() ? "" : " ") + word;
  return query;
}

/// Whether hits follow behind those of this page. Of a user's page all may be gone that were to be shown: files that
/// changed since they were indexed.
bool HasMore(const Json::Value& result, uint64_t offset) {
  return UintOf(result, "next_offset") > offset && offset + result["hits"].size() < UintOf(result, "total");
}

/// How many were found, which of them are shown, how long the engine took where it says so, and where more are.
void PrintSummary(const Json::Value& result, uint64_t offset) {
  const uint64_t total = UintOf(result, "total");
  const auto shown = static_cast<uint64_t>(result["hits"].size());
  (void)printf("%s found", Count(total).c_str());
  if (shown < total && shown != 0)
    (void)printf(", %s to %s shown", Count(offset + 1).c_str(), Count(offset + shown).c_str());
  if (result.isMember("took_us")) (void)printf(", %.1f ms", static_cast<double>(UintOf(result, "took_us")) / 1000);
  if (result["ranking_bounded"].asBool()) (void)printf("; so many match that only a part was ranked");
  if (HasMore(result, offset)) (void)printf("; more: --offset %s", result["next_offset"].asString().c_str());
  (void)printf("\n");
}

}  // namespace

Json::Value SearchMembers(const Arguments& arguments) {
  Json::Value data;
  data["query"] = JoinWords(arguments.words);
  data["limit"] = Json::Int64(arguments.Number("--limit", kLimitDefault, 1, kLimitMax));
  data["offset"] = Json::Int64(arguments.Number("--offset", 0, 0, kOffsetMax));
  data["sort"] = arguments.Get("--sort", "relevance");
  data["snippet"] = true;
  if (arguments.Has("--all-words")) data["all_words"] = true;
  if (arguments.Has("--explain")) data["explain"] = true;
  const bool json = arguments.Has("--json");
  if (isatty(STDOUT_FILENO) == 1 && !json) data["tell_fields"] = true;
  data["mark_start"] = json ? "[" : std::string(1, kMatchBegin);
  data["mark_end"] = json ? "]" : std::string(1, kMatchEnd);
  return data;
}

std::chrono::seconds FreshWait(const Arguments& arguments) {
  const bool given = !arguments.Get("--fresh").empty();
  return std::chrono::seconds(given ? arguments.Number("--fresh", 0, 0, kFreshSecondsMax) : kFreshSeconds);
}

Json::Value NothingSearched() {
  Json::Value nothing;
  nothing["total"] = 0;
  nothing["hits"] = Json::Value(Json::arrayValue);
  return nothing;
}

int PrintFound(const Arguments& arguments, Found found) {
  Json::Value& result = found.result;
  result["left_out"] = found.left_out.ToJson();
  if (!found.not_noticed.empty()) result["not_noticed"] = found.not_noticed;
  const uint64_t hits = result["hits"].isArray() ? result["hits"].size() : 0;
  const auto offset = static_cast<uint64_t>(arguments.Number("--offset", 0, 0, kOffsetMax));
  if (arguments.Has("--json")) {
    PrintJson(result);
  } else if (hits > 0 || HasMore(result, offset)) {
    const Terminal terminal = Terminal::OfOutput();
    PrintHowSearched(result);
    for (const Json::Value& hit : result["hits"]) PrintHit(hit, result["asked"], terminal);
    PrintSummary(result, offset);
  } else if (found.searched) {
    PrintNothingFound(result, found.left_out.Empty());
  }
  (void)fflush(stdout);
  for (const Json::Value& hint : result["hints"]) {
    if (hint.isString()) Warn(EscapeOneLine(hint.asString()));
  }
  if (!found.not_noticed.empty()) Warn(found.not_noticed);
  found.left_out.Warn();
  const bool partial = arguments.Has("--partial");
  if (found.stale && !partial) (void)fprintf(stderr, "%s\n", kWithoutFresh);
  if (!found.left_out.Empty() && !partial) return kIncomplete;
  return hits > 0 ? kDone : kNothingFound;
}

}  // namespace ferrox::cli
