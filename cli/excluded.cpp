#include "cli/excluded.h"

#include <sys/stat.h>

#include <utility>

#include "cli/command.h"
#include "fileindex/folders/folder_mgr.h"
#include "platform/host/exclusion_settings.h"
#include "sdk/share.h"
#include "services/support/folder_patterns.h"

namespace ferrox::cli {

std::vector<std::pair<std::string, base::PatternLists>> PatternsForAll() {
  std::vector<std::pair<std::string, base::PatternLists>> patterns;
  const std::string problem = kova::host::InstanceExclusions(patterns);
  if (!problem.empty()) throw Failure(problem);
  return patterns;
}

services::ExclusionRules RulesOf(const std::string& share) {
  services::ExclusionRules rules;
  rules.instance = PatternsForAll();
  const services::FolderPatterns patterns = services::LoadFolderPatterns();
  const fileindex::FolderMgr configured;
  for (const auto& folder : configured.GetFolders()) {
    if (folder->GetShare() != share) continue;
    const auto own = patterns.find(folder->GetPath());
    rules.folders[folder->GetFullPath()] = own == patterns.end() ? base::PatternLists() : own->second;
  }
  return rules;
}

services::ExclusionReason WhyExcluded(const std::string& share, const std::string& full_path) {
  struct stat status = {};
  const bool is_folder = lstat(full_path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
  return services::Exclusions(sdk::SDKShare(share).GetPath(), RulesOf(share)).Explain(full_path, is_folder);
}

std::string ExclusionText(const services::ExclusionReason& reason, const std::string& full_path) {
  if (reason.exclusion == services::Exclusion::kNone) return "";
  const std::string where =
      reason.line == 0 ? reason.origin : "line " + std::to_string(reason.line) + " of " + reason.origin;
  const std::string what = reason.path == full_path ? "it" : reason.path + " with all in it";
  const bool is_name_only = reason.exclusion == services::Exclusion::kNameOnly;
  return "the pattern \"" + reason.pattern + "\" (" + where + ") " +
         (is_name_only ? "has the index hold only the name of " + what : "leaves " + what + " out");
}

}  // namespace ferrox::cli
