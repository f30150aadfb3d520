#include "services/fileindexd/share_folders.h"

#include <algorithm>
#include <optional>

#include <json/value.h>

#include "base/path.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "sdk/share.h"
#include "services/fileindexd/indexed_shares.h"
#include "services/support/folder_patterns.h"

namespace ferrox::indexd {

namespace {

using fileindex::kContentKindNames;

constexpr char kInner[] = "inner";
constexpr char kExclusions[] = "exclusions";
constexpr char kEverywhere[] = "";

bool SameEverywhere(const services::ExclusionRules& ours, const services::ExclusionRules& theirs) {
  return std::equal(ours.instance.begin(), ours.instance.end(), theirs.instance.begin(), theirs.instance.end(),
                    [](const auto& left, const auto& right) { return left.second == right.second; });
}

}  // namespace

ShareFolders ShareFolders::FromJson(const Json::Value& stored) {
  ShareFolders folders;
  if (!IsJsonObject(stored)) throw Error(Error::kBadArgument, "not an object");
  const Json::Value& inner = stored[kInner];
  for (Json::ArrayIndex i = 0; inner.isArray() && i < inner.size(); ++i) {
    if (inner[i].isString()) folders.AddInner(inner[i].asString(), "");
  }
  for (const std::string& path : stored.getMemberNames()) {
    if (path == kInner || path == kExclusions) continue;
    Kinds kinds = {};
    for (size_t kind = 0; kind < kinds.size(); ++kind) {
      GetJsonValue(kinds[kind], stored[path], kContentKindNames[kind], true);
    }
    folders.Add(path, kinds);
  }
  const auto read = [](const Json::Value& lists, base::PatternLists& into) {
    if (!services::FromJson(lists, into)) throw Error(Error::kBadArgument, "not lists of patterns");
  };
  const Json::Value& exclusions = stored[kExclusions];
  if (!exclusions.isObject()) return folders;
  for (const Json::Value& lists : exclusions[kEverywhere])
    read(lists, folders.exclusions_.instance.emplace_back().second);
  for (auto& [path, lists] : folders.exclusions_.folders) {
    if (exclusions.isMember(path)) read(exclusions[path], lists);
  }
  return folders;
}

Json::Value ShareFolders::ToJson() const {
  Json::Value stored(Json::objectValue);
  for (const auto& [path, kinds] : kinds_) {
    for (size_t kind = 0; kind < kinds.size(); ++kind) stored[path][kContentKindNames[kind]] = kinds[kind];
  }
  for (const auto& [path, name] : inner_) stored[kInner].append(path);
  for (const auto& [origin, lists] : exclusions_.instance) {
    stored[kExclusions][kEverywhere].append(services::ToJson(lists));
  }
  for (const auto& [path, lists] : exclusions_.folders) {
    if (!lists.Empty()) stored[kExclusions][path] = services::ToJson(lists);
  }
  return stored;
}

ShareFolders ShareFolders::Load(const std::string& share, const std::string& root, const InstancePatterns& patterns) {
  ShareFolders loaded;
  loaded.recycle_bin_ = sdk::SDKShare(share).IsEnableRecycleBin();
  // A folder that is renamed has its patterns under both names while it is saved: one of the two readings has them.
  services::FolderPatterns before = services::LoadFolderPatterns();
  const fileindex::FolderMgr folder_mgr;
  services::FolderPatterns of_folders = services::LoadFolderPatterns();
  of_folders.merge(before);
  loaded.exclusions_.instance = patterns;
  for (const auto& folder : folder_mgr.GetFolders()) {
    const std::string& path = folder->GetPath();
    if (!base::IsAtOrBelow(path, "/" + share)) continue;
    loaded.any_paused_ = loaded.any_paused_ || folder->IsPaused();
    const std::string full_path = root + path.substr(1 + share.size());
    loaded.Add(full_path, fileindex::KindsOf(*folder));
    const auto found = of_folders.find(path);
    if (found != of_folders.end()) loaded.exclusions_.folders[full_path] = found->second;
  }
  loaded.LoadInner(root, folder_mgr);
  return loaded;
}

void ShareFolders::LoadInner(const std::string& root, const fileindex::FolderMgr& folder_mgr) {
  missing_ = folder_mgr.GetIndexedShares();
  for (const std::string& name : sdk::SDKShare::Enum()) {
    const std::optional<std::string> path = missing_.count(name) != 0 ? RootOf(name) : std::nullopt;
    if (!path.has_value()) continue;
    missing_.erase(name);
    if (base::IsBelow(*path, root)) AddInner(*path, name);
  }
}

/// Of a path that stands twice, the first counts.
void ShareFolders::Add(const std::string& full_path, const Kinds& kinds) {
  (void)kinds_.emplace(full_path, kinds);
  by_full_path_.Insert(full_path, kinds);
  (void)exclusions_.folders.try_emplace(full_path);
}

void ShareFolders::AddInner(const std::string& full_path, const std::string& share) {
  inner_[full_path] = share;
  inner_by_full_path_.Insert(full_path, true);
}

/// The names do not matter.
bool ShareFolders::SameInner(const ShareFolders& other) const {
  return std::equal(inner_.begin(), inner_.end(), other.inner_.begin(), other.inner_.end(),
                    [](const auto& ours, const auto& theirs) { return ours.first == theirs.first; });
}

bool ShareFolders::MissInnerOf(const ShareFolders& before) const {
  return std::any_of(before.inner_.begin(), before.inner_.end(),
                     [this](const auto& inner) { return missing_.count(inner.second) != 0; });
}

/// Where the patterns for all folders come from does not matter.
bool ShareFolders::SameExclusions(const ShareFolders& other) const {
  return exclusions_.folders == other.exclusions_.folders && SameEverywhere(exclusions_, other.exclusions_);
}

/// Of a folder that both have.
bool ShareFolders::SamePatterns(const ShareFolders& other, const std::string& folder) const {
  return exclusions_.folders.at(folder) == other.exclusions_.folders.at(folder) &&
         SameEverywhere(exclusions_, other.exclusions_);
}

bool ShareFolders::IsInInner(std::string_view full_path) const {
  return !inner_.empty() && inner_by_full_path_.HasAtOrAbove(full_path);
}

ShareFolders::Place ShareFolders::PlaceOf(std::string_view full_path) const {
  if (IsInInner(full_path)) return Place::kOutside;
  if (Governing(full_path) != nullptr) return Place::kIndexed;
  return HasBelow(full_path) ? Place::kOnTheWay : Place::kOutside;
}

bool ShareFolders::HasBelow(std::string_view full_path) const {
  const auto next = kinds_.lower_bound(std::string(full_path) + "/");
  return next != kinds_.end() && base::IsBelow(next->first, full_path);
}

bool ShareFolders::WantsContent(const std::string& full_path) const {
  const Kinds* kinds = Governing(full_path);
  return kinds != nullptr && fileindex::WantsContent(*kinds, full_path);
}

std::vector<std::string> ShareFolders::Topmost(const std::string& full_path) const {
  if (PlaceOf(full_path) == Place::kIndexed) return {full_path};
  std::vector<std::string> topmost;
  auto at = kinds_.lower_bound(full_path + "/");
  for (; at != kinds_.end() && base::IsBelow(at->first, full_path); ++at) {
    if (Governing(Dirname(at->first)) == nullptr) topmost.push_back(at->first);
  }
  return topmost;
}

std::vector<std::string> ShareFolders::DifferingFrom(const ShareFolders& other) const {
  std::vector<std::string> differing;
  for (const auto& [path, kinds] : kinds_) {
    const auto theirs = other.kinds_.find(path);
    const bool same = theirs != other.kinds_.end() && theirs->second == kinds && SamePatterns(other, path);
    if (!same) differing.push_back(path);
  }
  for (const auto& [path, kinds] : other.kinds_) {
    if (kinds_.find(path) == kinds_.end()) differing.push_back(path);
  }
  for (const auto* inner : {&inner_, &other.inner_}) {
    for (const auto& [path, name] : *inner) {
      if (inner_.count(path) != other.inner_.count(path)) differing.push_back(path);
    }
  }
  return differing;
}

}  // namespace ferrox::indexd
