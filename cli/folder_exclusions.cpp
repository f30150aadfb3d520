#include "cli/folder_exclusions.h"

#include <algorithm>

#include <json/value.h>

#include "base/ignore_patterns.h"
#include "cli/escape.h"
#include "common/error.h"
#include "common/lock_file.h"
#include "common/paths.h"
#include "services/support/exclusion_source.h"
#include "services/support/folder_patterns.h"

namespace ferrox::cli {

namespace {

const Option kExclude = {"--exclude", "PATTERN", "leave files out, as .gitignore would; may be given several times",
                         false, true};
const Option kExcludeContent = {"--exclude-content", "PATTERN", "index files by name only; may be given several times",
                                false, true};
const Option kNoExclude = {"--no-exclude", nullptr, "drop the folders' patterns of before", false, true};

void RequirePattern(const std::string& pattern) {
  const bool is_line = pattern.find('\n') == std::string::npos;
  if (!is_line || !base::IgnorePatterns().Add(pattern, 0)) throw UsageError("\"" + pattern + "\" is no pattern");
}

/// Those that are new, behind those that are there.
void Append(std::vector<std::string>& list, const std::vector<std::string>& added) {
  for (const std::string& pattern : added) {
    RequirePattern(pattern);
    if (std::find(list.begin(), list.end(), pattern) == list.end()) list.push_back(pattern);
  }
}

void Change(const Arguments& arguments, const std::string& path, base::PatternLists& lists) {
  if (arguments.Has(kNoExclude.name)) lists = {};
  Append(lists.exclude, arguments.All(kExclude.name));
  Append(lists.exclude_content, arguments.All(kExcludeContent.name));
  if (lists.exclude.size() + lists.exclude_content.size() <= services::kIgnorePatternsMax) return;
  throw Failure(path + " would have more than 1,000 patterns; --no-exclude drops those of before");
}

/// In a moment in which nobody else changes the folders.
void Save(const services::FolderPatterns& patterns) {
  const LockFile lock(InstancePath(kFolderLockPath), true);
  services::SaveFolderPatterns(patterns);
}

std::string Line(const char* what, const Json::Value& patterns) {
  std::string line;
  for (const Json::Value& pattern : patterns) line += " " + EscapeForTerminal(pattern.asString());
  return line.empty() ? "" : std::string("    ") + what + ":" + line + "\n";
}

}  // namespace

std::vector<Option> ExclusionOptions() { return {kExclude, kExcludeContent, kNoExclude}; }

void ChangeWithPatterns(const Arguments& arguments, const std::vector<std::string>& paths,
                        const std::function<void()>& change) {
  const std::vector<Option> options = ExclusionOptions();
  const auto is_given = [&arguments](const Option& option) { return arguments.Has(option.name); };
  if (std::none_of(options.begin(), options.end(), is_given)) return change();
  const services::FolderPatterns before = services::LoadFolderPatterns();
  services::FolderPatterns after = before;
  for (const std::string& path : paths) Change(arguments, path, after[path]);
  Save(after);
  try {
    change();
  } catch (...) {
    Save(before);
    throw;
  }
}

base::PatternLists PatternsAfter(const Arguments& arguments, const std::string& path) {
  base::PatternLists lists = services::LoadFolderPatterns()[path];
  Change(arguments, path, lists);
  return lists;
}

std::string PatternText(const Json::Value& folder) {
  return Line("left out", folder["exclude"]) + Line("by name only", folder["exclude_content"]);
}

void AddPatterns(Json::Value& folders) {
  const services::FolderPatterns patterns = services::LoadFolderPatterns();
  for (Json::Value& folder : folders) {
    const auto found = patterns.find(folder["path"].asString());
    if (found == patterns.end()) continue;
    const Json::Value lists = services::ToJson(found->second);
    for (const std::string& name : lists.getMemberNames()) folder[name] = lists[name];
  }
}

}  // namespace ferrox::cli
