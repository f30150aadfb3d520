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

/// "\"license\" or \"licence\" instead of \"lincense\"", commas between several. `also`: of words that were searched
/// for as they are, too, "\"book\" beside \"bok\"". "" for none.
std::string RepairedList(const Json::Value& result, bool also) {
  std::string list;
  std::string before;
  const auto end_of = [also](const std::string& from) {
    return from.empty() ? from : (also ? " beside " : " instead of ") + from;
  };
  for (const Json::Value& word : result["repaired"]) {
    if (BoolOf(word, "also") != also) continue;
    const std::string from = Quoted(word, "from");
    list += (from == before ? " or " : end_of(before) + (list.empty() ? "" : ", ")) + Quoted(word, "to");
    before = from;
  }
  return list + end_of(before);
}

/// "searched for "car" also as "automobile"".
void PrintSynonyms(const Json::Value& result) {
  std::string list;
  for (const Json::Value& word : result["synonyms"]) {
    list += (list.empty() ? "" : ", ") + Quoted(word, "from") + " also as " + Quoted(word, "to");
  }
  if (!list.empty()) (void)printf("searched for %s\n", list.c_str());
}

}  // namespace

void PrintHowSearched(const Json::Value& result) {
  const std::string repaired = RepairedList(result, false);
  const std::string also = RepairedList(result, true);
  if (!repaired.empty()) (void)printf("searched for %s\n", repaired.c_str());
  if (!also.empty()) (void)printf("also searched for %s\n", also.c_str());
  PrintSynonyms(result);
  const std::string ignored = WordList(result["ignored"]);
  if (!ignored.empty()) (void)printf("too common to find files by themselves: %s\n", ignored.c_str());
  const std::string some = Count(UintOf(result, "total"));
  if (BoolOf(result, "none_has_all")) {
    (void)printf("no file has all words; these have some of them\n");
  } else if (result.isMember("total_all") && UintOf(result, "total_all") == 0) {
    (void)printf("no file has all words; %s have some of them\n", some.c_str());
  } else if (result.isMember("total_all")) {
    (void)printf("%s with all words, %s with some of them\n", Count(UintOf(result, "total_all")).c_str(), some.c_str());
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
  std::string sentence = complete ? "nothing found" : "nothing found in what was searched";
  for (const bool also : {false, true}) {
    const std::string repaired = RepairedList(result, also);
    if (!repaired.empty()) sentence += ", nor for " + repaired;
  }
  const std::string similar = WordList(result["suggestions"]);
  if (!similar.empty()) sentence += ". Did you mean: " + similar + "?";
  (void)fprintf(stderr, "%s\n", sentence.c_str());
}

}  // namespace ferrox::cli
