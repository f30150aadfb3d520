#pragma once

#include <functional>
#include <string>
#include <vector>

#include <json/forwards.h>

#include "base/pattern_lists.h"
#include "cli/command.h"

/// The patterns of indexed folders, which are kept beside the list of folders (services/support/folder_patterns.h).
namespace ferrox::cli {

/// The options by which 'folder add' and 'folder set' change them.
std::vector<Option> ExclusionOptions();

/// Runs `change`, which adds or changes the folders of these share paths, with the patterns changed as the options say:
/// the folders are never indexed without. When it fails, the patterns are as they were. @throws UsageError for what is
/// no pattern; Failure when there would be too many; what `change` throws; Error.
void ChangeWithPatterns(const Arguments& arguments, const std::vector<std::string>& paths,
                        const std::function<void()>& change);

/// The patterns that the folder of this share path would then have. @throws as ChangeWithPatterns.
base::PatternLists PatternsAfter(const Arguments& arguments, const std::string& path);

/// Lines for people, indented, on what is left out of a folder; "" without patterns of its own.
std::string PatternText(const Json::Value& folder);
/// Adds "exclude" and "exclude_content" to stored forms of folders, where they have such patterns.
void AddPatterns(Json::Value& folders);

}  // namespace ferrox::cli
