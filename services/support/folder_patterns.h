#pragma once

#include <map>
#include <string>

#include <json/forwards.h>

#include "base/pattern_lists.h"

namespace ferrox::services {

/// The patterns of indexed folders, by share path: "/photo/trips". Kept beside the folders (docs/exclusions.md), and
/// only for folders that have any; the library's operations carry them along when folders are renamed or deleted.
using FolderPatterns = std::map<std::string, base::PatternLists, std::less<>>;

/// The present ones; none without a file. @throws Error kLoadFailed: who indexed without them would index what was to
/// be left out.
FolderPatterns LoadFolderPatterns();
/// Replaces the file whole; empty lists are not kept. To be called under the folder lock, as root or the instance's
/// owner. @throws Error kSaveFailed.
void SaveFolderPatterns(const FolderPatterns& patterns);

/// {"exclude": [...], "exclude_content": [...]}, without empty lists.
Json::Value ToJson(const base::PatternLists& lists);
/// Back from it; false for anything else.
bool FromJson(const Json::Value& json, base::PatternLists& lists);

}  // namespace ferrox::services
