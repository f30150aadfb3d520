#include <unistd.h>

#include <chrono>
#include <cstdio>

#include "cli/ask.h"
#include "cli/command_table.h"
#include "cli/escape.h"
#include "cli/format.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::cli {

namespace {

constexpr long long kLimitDefault = 10;
constexpr long long kLimitMax = 1000;
constexpr long long kFreshSeconds = 30;
constexpr long long kFreshSecondsMax = 600;
/// What the engine puts around a match. Not shown: each becomes what the output can show.
constexpr char kMarkStart = '\x02';
constexpr char kMarkEnd = '\x03';

std::string JoinWords(const std::vector<std::string>& words) {
  std::string query;
  for (const std::string& word : words) query += (query.empty() ? "" : " ") + word;
  return query;
}

Json::Value SearchRequest(const Arguments& arguments) {
  Json::Value data;
  data["query"] = JoinWords(arguments.words);
  if (arguments.Has("--share")) {
    data["id"] = fileindex::elastic::GetFileIndexID(sdk::SDKShare(arguments.Get("--share")).GetName());
  }
  data["limit"] = Json::Int64(arguments.Number("--limit", kLimitDefault, 1, kLimitMax));
  data["offset"] = Json::Int64(arguments.Number("--offset", 0, 0, 1000000000));
  data["sort"] = arguments.Get("--sort", "relevance");
  data["snippet"] = true;
  const bool json = arguments.Has("--json");
  data["mark_start"] = json ? "[" : std::string(1, kMarkStart);
  data["mark_end"] = json ? "]" : std::string(1, kMarkEnd);
  return data;
}

std::string KindOf(const Json::Value& fields, const std::string& path) {
  constexpr const char* kKinds[] = {"document", "audio", "video", "image", "other"};
  if (fields["KOVAMDIsDir"].isBool() && fields["KOVAMDIsDir"].asBool()) return "folder";
  return kKinds[fileindex::GetFileTypeByFullPath(path)];
}

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

void PrintHit(const Json::Value& hit, bool on_terminal) {
  const Json::Value& fields = hit["fields"];
  const std::string path = TextOf(hit, "doc_id");
  const std::string shown = EscapeForTerminal(path);
  (void)printf("%s\n", on_terminal ? ("\033[36m" + shown + "\033[0m").c_str() : shown.c_str());
  const std::string snippet = TextOf(hit, "snippet");
  if (!snippet.empty()) (void)printf("    %s\n", ShowSnippet(snippet, on_terminal).c_str());
  (void)printf("    %s, %s, %s\n", KindOf(fields, path).c_str(), Size(IntOf(fields, "KOVAMDFSSize")).c_str(),
               Date(IntOf(fields, "KOVAMDFSContentChangeDate")).c_str());
}

void PrintSummary(const Json::Value& result, uint64_t offset) {
  const uint64_t total = UintOf(result, "total");
  const auto shown = static_cast<uint64_t>(result["hits"].size());
  const double milliseconds = static_cast<double>(UintOf(result, "took_us")) / 1000;
  (void)printf("%s found", Count(total).c_str());
  if (shown < total) (void)printf(", %s to %s shown", Count(offset + 1).c_str(), Count(offset + shown).c_str());
  (void)printf(", %.1f ms%s\n", milliseconds,
               result["ranking_bounded"].asBool() ? "; so many match that only a part was ranked" : "");
}

void PrintNothingFound(const Json::Value& result) {
  std::string similar;
  for (const Json::Value& word : result["suggestions"]) {
    if (word.isString()) similar += (similar.empty() ? "; there is: " : ", ") + EscapeForTerminal(word.asString());
  }
  (void)fprintf(stderr, "nothing found%s\n", similar.c_str());
}

/// Whether the index is known to hold all that was changed before; says why not.
bool IsFresh(const Arguments& arguments) try {
  const bool given = !arguments.Get("--fresh").empty();
  AwaitChanges(arguments.Get("--share"),
               std::chrono::seconds(given ? arguments.Number("--fresh", 0, 0, kFreshSecondsMax) : kFreshSeconds));
  return true;
} catch (const Failure& failure) {
  (void)fprintf(stderr, "fileindexctl: %s\nWithout --fresh the search shows what is indexed by now.\n",
                EscapeForTerminal(failure.what()).c_str());
  return false;
}

}  // namespace

int RunSearch(const Arguments& arguments) {
  const Json::Value request = SearchRequest(arguments);
  if (arguments.Has("--fresh") && !IsFresh(arguments)) return kNotFresh;
  const Json::Value result = Search(request);
  const uint64_t hits = result["hits"].isArray() ? result["hits"].size() : 0;
  if (arguments.Has("--json")) {
    (void)printf("%s\n", ToScriptJson(result).c_str());
  } else if (hits > 0) {
    const bool on_terminal = isatty(STDOUT_FILENO) == 1;
    for (const Json::Value& hit : result["hits"]) PrintHit(hit, on_terminal);
    PrintSummary(result, UintOf(request, "offset"));
  } else {
    PrintNothingFound(result);
  }
  return hits > 0 ? kDone : kNothingFound;
}

}  // namespace ferrox::cli
