#include "services/fileindexd/share_folders.h"

#include <algorithm>
#include <set>

#include <json/value.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::indexd {

namespace {

constexpr std::array<const char*, 4> kKindNames = {"document", "audio", "video", "photo"};
constexpr char kInner[] = "inner";

/// The indexed shares below a folder: their names, by their own folders.
std::map<std::string, std::string, std::less<>> SharesBelow(const std::string& root,
                                                            const fileindex::FolderMgr& folder_mgr) {
  std::map<std::string, std::string, std::less<>> below;
  const std::set<std::string> indexed = folder_mgr.GetIndexedShares();
  for (const std::string& name : sdk::SDKShare::Enum()) {
    if (indexed.count(name) == 0) continue;
    const std::string path = sdk::SDKShare(name).GetPath();
    if (StringStartWith(path, root + "/")) below[path] = name;
  }
  return below;
}

}  // namespace

ShareFolders ShareFolders::FromJson(const Json::Value& stored) {
  ShareFolders folders;
  if (!IsJsonObject(stored)) throw Error(Error::kBadArgument, "not an object");
  const Json::Value& inner = stored[kInner];
  for (Json::ArrayIndex i = 0; inner.isArray() && i < inner.size(); ++i) {
    if (inner[i].isString()) folders.inner_[inner[i].asString()] = "";
  }
  for (const std::string& path : stored.getMemberNames()) {
    if (path == kInner) continue;
    Kinds& kinds = folders.kinds_[path];
    for (size_t kind = 0; kind < kinds.size(); ++kind) {
      GetJsonValue(kinds[kind], stored[path], kKindNames[kind], true);
    }
  }
  return folders;
}

Json::Value ShareFolders::ToJson() const {
  Json::Value stored(Json::objectValue);
  for (const auto& [path, kinds] : kinds_) {
    for (size_t kind = 0; kind < kinds.size(); ++kind) stored[path][kKindNames[kind]] = kinds[kind];
  }
  for (const auto& [path, name] : inner_) stored[kInner].append(path);
  return stored;
}

ShareFolders ShareFolders::Load(const std::string& share, const std::string& root) {
  ShareFolders loaded;
  loaded.recycle_bin_ = sdk::SDKShare(share).IsEnableRecycleBin();
  const fileindex::FolderMgr folder_mgr;
  for (const auto& folder : folder_mgr.GetFolders()) {
    const std::string& path = folder->GetPath();
    if (!StringStartWith(path + "/", "/" + share + "/")) continue;
    loaded.any_paused_ = loaded.any_paused_ || folder->IsPaused();
    // Of a path that stands twice, the first counts.
    (void)loaded.kinds_.emplace(root + path.substr(1 + share.size()),
                                Kinds{folder->IsDocument(), folder->IsAudio(), folder->IsVideo(), folder->IsPhoto()});
  }
  loaded.inner_ = SharesBelow(root, folder_mgr);
  return loaded;
}

const ShareFolders::Kinds* ShareFolders::Governing(std::string_view full_path) const {
  for (size_t end = full_path.size(); end != std::string_view::npos && end > 0; end = full_path.rfind('/', end - 1)) {
    const auto found = kinds_.find(full_path.substr(0, end));
    if (found != kinds_.end()) return &found->second;
  }
  return nullptr;
}

/// The names do not matter.
bool ShareFolders::SameInner(const ShareFolders& other) const {
  return std::equal(inner_.begin(), inner_.end(), other.inner_.begin(), other.inner_.end(),
                    [](const auto& ours, const auto& theirs) { return ours.first == theirs.first; });
}

bool ShareFolders::IsInInner(std::string_view full_path) const {
  if (inner_.empty()) return false;
  for (size_t end = full_path.size(); end != std::string_view::npos && end > 0; end = full_path.rfind('/', end - 1)) {
    if (inner_.find(full_path.substr(0, end)) != inner_.end()) return true;
  }
  return false;
}

ShareFolders::Place ShareFolders::PlaceOf(std::string_view full_path) const {
  if (IsInInner(full_path)) return Place::kOutside;
  if (Governing(full_path) != nullptr) return Place::kIndexed;
  const std::string below = std::string(full_path) + "/";
  const auto next = kinds_.lower_bound(below);
  return next != kinds_.end() && StringStartWith(next->first, below) ? Place::kOnTheWay : Place::kOutside;
}

bool ShareFolders::WantsContent(const std::string& full_path) const {
  const Kinds* kinds = Governing(full_path);
  if (kinds == nullptr) return false;
  const auto type = static_cast<size_t>(fileindex::GetFileTypeByFullPath(full_path));
  return type >= kinds->size() || (*kinds)[type];
}

std::vector<std::string> ShareFolders::Topmost(const std::string& full_path) const {
  if (PlaceOf(full_path) == Place::kIndexed) return {full_path};
  std::vector<std::string> topmost;
  const std::string below = full_path + "/";
  for (auto at = kinds_.lower_bound(below); at != kinds_.end() && StringStartWith(at->first, below); ++at) {
    if (Governing(Dirname(at->first)) == nullptr) topmost.push_back(at->first);
  }
  return topmost;
}

std::vector<std::string> ShareFolders::DifferingFrom(const ShareFolders& other) const {
  std::vector<std::string> differing;
  for (const auto& [path, kinds] : kinds_) {
    const auto theirs = other.kinds_.find(path);
    if (theirs == other.kinds_.end() || theirs->second != kinds) differing.push_back(path);
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
