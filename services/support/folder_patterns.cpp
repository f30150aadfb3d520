#include "services/support/folder_patterns.h"

#include <utility>
#include <vector>

#include <json/value.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "common/subject_error.h"

namespace ferrox::services {

namespace {

constexpr std::pair<const char*, std::vector<std::string> base::PatternLists::*> kLists[] = {
    {"exclude", &base::PatternLists::exclude},
    {"exclude_content", &base::PatternLists::exclude_content},
};

bool ReadPatterns(const std::string& path, FolderPatterns& patterns) {
  Json::Value stored;
  if (!fromFile(stored, path) || !IsJsonObject(stored)) return false;
  for (const std::string& folder : stored.getMemberNames()) {
    if (!FromJson(stored[folder], patterns[folder])) return false;
  }
  return true;
}

}  // namespace

Json::Value ToJson(const base::PatternLists& lists) {
  Json::Value json(Json::objectValue);
  for (const auto& [name, list] : kLists) {
    for (const std::string& pattern : lists.*list) json[name].append(pattern);
  }
  return json;
}

bool FromJson(const Json::Value& json, base::PatternLists& lists) {
  if (!json.isObject()) return false;
  for (const auto& [name, list] : kLists) {
    const Json::Value& stored = json[name];
    if (!stored.isNull() && !stored.isArray()) return false;
    for (const Json::Value& pattern : stored) {
      if (!pattern.isString()) return false;
      (lists.*list).push_back(pattern.asString());
    }
  }
  return true;
}

FolderPatterns LoadFolderPatterns() {
  const std::string path = InstancePath(kFileIndexExclusionsCfgPath);
  FolderPatterns patterns;
  const bool usable = !IsFileExist(path) || ReadPatterns(path, patterns);
  FERROX_FAIL_IF_AS(!usable, "!ReadPatterns(kFileIndexExclusionsCfgPath)", Error::kLoadFailed, path,
                    Subject{Subject::kFile, path});
  return patterns;
}

void SaveFolderPatterns(const FolderPatterns& patterns) {
  const std::string path = InstancePath(kFileIndexExclusionsCfgPath);
  Json::Value stored(Json::objectValue);
  for (const auto& [folder, lists] : patterns) {
    if (!lists.Empty()) stored[folder] = ToJson(lists);
  }
  FERROX_FAIL_IF_AS(!toFile(stored, path), "!stored.toFile(kFileIndexExclusionsCfgPath)", Error::kSaveFailed, path,
                    Subject{Subject::kFile, path});
}

}  // namespace ferrox::services
