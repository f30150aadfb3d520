#include "cli/search_notes.h"

#include <cstdio>

#include "base/text.h"
#include "cli/escape.h"
#include "cli/format.h"

namespace ferrox::cli {

namespace {

/// Words of the reply with commas between them.
std::string WordList(const Json::Value& words) {
  std::string list;
  for (const Json::Value& word : words) {
    if (word.isString()) list += (list.empty() ? "" : ", ") + EscapeOneLine(word.asString());
  }
  return list;
}

std::string Quoted(const Json::Value& object, const char* key) {
  return "\"" + EscapeOneLine(TextOf(object, key)) + "\"";
}

/// "searched for "a" as "b" or "c", "d" as "e"". `also`: of words that were searched for as they are, too.
void PrintRepaired(const Json::Value& result, bool also) {
  std::string line;
  std::string before;
  for (const Json::Value& word : result["repaired"]) {
    if (BoolOf(word, "also") != also) continue;
    const std::string from = Quoted(word, "from");
    line += (from == before ? " or " : (line.empty() ? "" : ", ") + from + " as ") + Quoted(word, "to");
    before = from;
  }
  if (!line.empty()) (void)printf("%s %s\n", also ? "also searched for" : "searched for", line.c_str());
}

}  // namespace

void PrintHowSearched(const Json::Value& result) {
  PrintRepaired(result, false);
  PrintRepaired(result, true);
  const std::string ignored = WordList(result["ignored"]);
  if (!ignored.empty()) (void)printf("in so many files that they find none by themselves: %s\n", ignored.c_str());
  const std::string some = Count(UintOf(result, "total"));
  if (BoolOf(result, "none_has_all")) {
    (void)printf("no file has all words; these have some\n");
  } else if (result.isMember("total_all") && UintOf(result, "total_all") == 0) {
    (void)printf("no file has all words, %s with some\n", some.c_str());
  } else if (result.isMember("total_all")) {
    (void)printf("%s with all words, %s with some\n", Count(UintOf(result, "total_all")).c_str(), some.c_str());
  }
}

std::string TitleToShow(const Json::Value& hit, const std::string& path) {
  const std::string title = EscapeOneLine(TextOf(hit, "title"));
  const std::string name = base::LowerAscii(EscapeOneLine(path.substr(path.rfind('/') + 1)));
  const std::string lower = base::LowerAscii(title);
  return lower == name || lower == name.substr(0, name.rfind('.')) ? std::string() : title;
}

void PrintExplanation(const Json::Value& hit) {
  if (!hit["explain"].isArray()) return;
  (void)printf("    score %.2f\n", hit["score"].isNumeric() ? hit["score"].asDouble() : 0);
  for (const Json::Value& part : hit["explain"]) {
    const std::string where = EscapeOneLine(TextOf(part, "where"));
    (void)printf("      %+.2f  %s%s\n", part["adds"].isNumeric() ? part["adds"].asDouble() : 0,
                 EscapeOneLine(TextOf(part, "what")).c_str(), where.empty() ? "" : (" in " + where).c_str());
  }
}

void PrintNothingFound(const Json::Value& result, bool complete) {
  const std::string similar = WordList(result["suggestions"]);
  (void)fprintf(stderr, "%s%s\n", complete ? "nothing found" : "no hit in what was searched",
                similar.empty() ? "" : (". Did you mean: " + similar + "?").c_str());
}

}  // namespace ferrox::cli
