#define FERROX_SOURCE "index_mgr"

#include "fileindex/operations/folder_patterns.h"

#include <syslog.h>

#include <set>

#include <json/value.h>

#include "base/path.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/folders/folder_mgr.h"
#include "sdk/credentials.h"

namespace ferrox::fileindex {

namespace {

std::string PatternsPath() { return InstancePath(kFileIndexExclusionsCfgPath); }

/// Null without a file.
Json::Value LoadPatterns() {
  Json::Value patterns;
  if (!IsFileExist(PatternsPath())) return patterns;
  FERROX_FAIL_IF(!fromFile(patterns, PatternsPath()) || !IsJsonObject(patterns), Error::kLoadFailed, PatternsPath());
  return patterns;
}

void SavePatterns(const Json::Value& patterns) {
  const sdk::SDKCredentials credentials("root");
  FERROX_FAIL_IF(!toFile(patterns, PatternsPath()), Error::kSaveFailed, PatternsPath());
}

}  // namespace

void CopyFolderPatterns(const std::string& from, const std::string& to) {
  const Json::Value before = LoadPatterns();
  Json::Value after = before;
  if (before.isNull()) return;
  for (const std::string& path : before.getMemberNames()) {
    if (base::IsAtOrBelow(path, from)) after[to + path.substr(from.size())] = before[path];
  }
  if (after != before) SavePatterns(after);
}

void DropFolderPatterns(const FolderMgr& folder_mgr) try {
  Json::Value patterns = LoadPatterns();
  if (patterns.isNull()) return;
  std::set<std::string> folders;
  for (const auto& folder : folder_mgr.GetFolders()) folders.insert(folder->GetPath());
  bool dropped = false;
  for (const std::string& path : patterns.getMemberNames()) {
    if (folders.count(path) != 0) continue;
    patterns.removeMember(path);
    dropped = true;
  }
  if (dropped) SavePatterns(patterns);
} catch (const Error& error) {
  Log(LOG_WARNING, "patterns of folders that are gone stay in %s: %s", PatternsPath().c_str(), error.what());
}

}  // namespace ferrox::fileindex
