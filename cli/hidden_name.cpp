#include "cli/hidden_name.h"

#include <cstdio>
#include <memory>
#include <vector>

#include "base/name_rules.h"
#include "cli/escape.h"
#include "platform/host/share_table.h"

namespace ferrox::cli {

namespace {

/// "" where none of the patterns matches a name in `below`.
std::string MatchingPattern(const std::vector<std::string>& patterns, bool case_counts, const std::string& below) {
  for (const std::string& pattern : patterns) {
    if (base::NameRules(base::NameRules::TextOf({pattern}, case_counts)).MatchAnyIn(below)) return pattern;
  }
  return "";
}

}  // namespace

std::string RuleThatHidesName(const std::string& full_path) {
  const std::shared_ptr<const kova::host::ShareTable> table = kova::host::ShareTable::Current();
  const kova::host::ShareEntry* share = table == nullptr ? nullptr : table->ByFullPath(full_path);
  if (share == nullptr) return "";
  const std::string below = full_path.substr(share->path.size());
  const kova::host::ShareNames& names = share->names;
  const std::string veto = MatchingPattern(names.veto, names.case_counts, below);
  const std::string pattern = veto.empty() ? MatchingPattern(names.hide, names.case_counts, below) : veto;
  if (pattern.empty()) return "";
  return std::string("hidden by ") + (veto.empty() ? "hide" : "veto") + " files = " + pattern + " of share " +
         share->name;
}

void PrintHiding(const std::string& rule) {
  if (!rule.empty()) (void)printf("    for this user by way of another program: %s\n", EscapeForTerminal(rule).c_str());
}

}  // namespace ferrox::cli
