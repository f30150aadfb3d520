#include <cstdio>

#include <json/value.h>

#include "cli/command_table.h"
#include "cli/escape.h"
#include "cli/excluded.h"
#include "cli/output.h"
#include "services/support/folder_patterns.h"

/// The settings that hold for the whole instance.
namespace ferrox::cli {

namespace {

/// One list, wrapped at words.
void PrintPatterns(const char* what, const std::vector<std::string>& patterns) {
  constexpr size_t kLineBytes = 100;
  if (patterns.empty()) return;
  std::string line = std::string("    ") + what + ":";
  for (const std::string& pattern : patterns) {
    const std::string shown = " " + EscapeForTerminal(pattern);
    if (line.size() + shown.size() > kLineBytes) {
      (void)printf("%s\n", line.c_str());
      line = "       ";
    }
    line += shown;
  }
  (void)printf("%s\n", line.c_str());
}

}  // namespace

int RunConfigShow(const Arguments& arguments) {
  const auto patterns = PatternsForAll();
  if (arguments.Has("--json")) {
    Json::Value json;
    json["exclusions"] = Json::Value(Json::arrayValue);
    for (const auto& [origin, lists] : patterns) {
      Json::Value& entry = json["exclusions"].append(services::ToJson(lists));
      entry["origin"] = origin;
    }
    PrintJson(json);
    return kDone;
  }
  (void)printf("left out of all indexed folders, unless a later pattern takes it back:\n");
  for (const auto& [origin, lists] : patterns) {
    (void)printf("  %s\n", EscapeForTerminal(origin).c_str());
    PrintPatterns("not at all", lists.exclude);
    PrintPatterns("by name only", lists.exclude_content);
  }
  if (patterns.empty()) (void)printf("  nothing\n");
  return kDone;
}

}  // namespace ferrox::cli
