#include "fileindex/folders/folder_mgr.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <optional>
#include <unordered_map>

#include <kova/error.h>

#include "base/path_table.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/new_class.h"
#include "common/paths.h"
#include "fileindex/folders/folder_rule.h"
#include "fileindex/folders/folder_share.h"
#include "fileindex/util.h"
#include "sdk/credentials.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

namespace {

using Flag = bool (Folder::*)() const;

/// In this instance.
std::string FoldersPath() { return InstancePath(kFileIndexFoldersCfgPath); }

bool ReadFolders(Json::Value& folders, const std::string& path) {
  return fromFile(folders, path) && IsJsonArray(folders);
}

/// The flag that a listing is sorted by, null for another key.
Flag FlagOf(const std::string& sort_by) {
  if (sort_by == "document") return &Folder::IsDocument;
  if (sort_by == "audio") return &Folder::IsAudio;
  if (sort_by == "video") return &Folder::IsVideo;
  if (sort_by == "photo") return &Folder::IsPhoto;
  return nullptr;
}

/// Stable, so that entries that are equal under the key keep the file's order. Another key than these sorts nothing.
void SortFolders(std::vector<std::shared_ptr<Folder>>& folders, const std::string& sort_by) {
  const auto sort = [&folders](const auto& is_before) { std::stable_sort(folders.begin(), folders.end(), is_before); };
  if (sort_by == "path") {
    sort([](const auto& a, const auto& b) { return a->GetPath() < b->GetPath(); });
  } else if (const Flag flag = FlagOf(sort_by); flag != nullptr) {
    sort([flag](const auto& a, const auto& b) { return (a.get()->*flag)() && !(b.get()->*flag)(); });
  }
}

}  // namespace

/// Where the entries lie. The platform is asked once for each share, whatever the number of its folders.
struct FolderLookup {
  /// What comes before the share paths of a share in full paths; null when there is no such share.
  /// @throws Error kNoSuchShare when the platform cannot tell.
  const std::string* VolumeOf(const std::string& share);
  /// The entry's full path; null when it has none and so governs nothing. Throws likewise.
  const std::string* FullPathOf(const Folder& folder);
  /// Enters what is not in yet; of entries that name the same folder, as those of shares that lie in one another may,
  /// the first. Throws likewise. @return those that govern nothing.
  std::string Fill(const std::vector<std::shared_ptr<Folder>>& folders);

  base::PathTable<std::shared_ptr<Folder>> by_full_path;

 private:
  std::unordered_map<std::string, std::optional<std::string>> volumes_;
};

const std::string* FolderLookup::VolumeOf(const std::string& share) {
  const auto [found, is_new] = volumes_.try_emplace(share);
  std::optional<std::string>& volume = found->second;
  if (is_new) {
    try {
      volume = Dirname(sdk::SDKShare(share).GetPath());
    } catch (const Error&) {
      // Only a share that is known to be gone has no folders: a platform that fails must not look like "not indexed".
      if (KLIBCErrGet() != KOVA_ERR_NO_SUCH_SHARE) {
        (void)volumes_.erase(found);
        throw;
      }
    }
  }
  return volume ? &*volume : nullptr;
}

const std::string* FolderLookup::FullPathOf(const Folder& folder) {
  const std::string* volume = HasShare(folder) ? VolumeOf(folder.GetShare()) : nullptr;
  return volume != nullptr ? &folder.FullPathBelow(*volume) : nullptr;
}

std::string FolderLookup::Fill(const std::vector<std::shared_ptr<Folder>>& folders) {
  std::string idle;
  for (const auto& folder : folders) {
    const std::string* full_path = FullPathOf(*folder);
    if (full_path != nullptr) {
      by_full_path.Insert(*full_path, folder);
    } else {
      idle += " " + folder->GetPath();
    }
  }
  return idle;
}

FolderMgr::FolderMgr() {
  const std::string path = FoldersPath();
  Json::Value folders(Json::arrayValue);
  FERROX_FAIL_IF_AS(IsFileExist(path) && !ReadFolders(folders, path),
                    "IsFileExist(kFileIndexFoldersCfgPath) && !folders.fromFile(kFileIndexFoldersCfgPath)",
                    Error::kLoadFailed, "Cannot load json: " + path, Subject{Subject::kFile, path});
  folders_.reserve(folders.size());
  for (const Json::Value& folder : folders) folders_.push_back(newClass<Folder>(folder));
}

FolderMgr::~FolderMgr() = default;

void FolderMgr::Save() const {
  const std::string path = FoldersPath();
  const sdk::SDKCredentials credentials("root");
  Json::Value folders(Json::arrayValue);
  for (const auto& folder : folders_) folders.append(folder->GetData());
  FERROX_FAIL_IF_AS(!toFile(folders, path), "!folders.toFile(kFileIndexFoldersCfgPath)", Error::kSaveFailed, path,
                    Subject{Subject::kFile, path});
  FERROX_FAIL_IF_AS(-1 == chmod(path.c_str(), 0644), "-1 == chmod(kFileIndexFoldersCfgPath, 0644)", Error::kInternal,
                    path, Subject{Subject::kFile, path});
}

FolderLookup& FolderMgr::ByFullPath() const {
  if (lookup_ != nullptr) return *lookup_;
  auto lookup = std::make_unique<FolderLookup>();
  const std::string idle = lookup->Fill(folders_);
  if (!idle.empty()) {
    Log(LOG_WARNING, "%s: these folders govern nothing, as their share does not exist:%s",
        ModuleName(FERROX_SOURCE).c_str(), idle.c_str());
  }
  lookup_ = std::move(lookup);
  return *lookup_;
}

void FolderMgr::Get(std::shared_ptr<Folder>& out, const std::string& path) const {
  const auto it =
      std::find_if(folders_.begin(), folders_.end(), [&path](const auto& folder) { return folder->GetPath() == path; });
  FERROX_FAIL_IF_AS(it == folders_.end(), "it == folders_.end()", Error::kNoSuchFolder, path);
  out = *it;
}

bool FolderMgr::HasFolder(const std::string& path) const {
  return std::any_of(folders_.begin(), folders_.end(),
                     [&path](const auto& folder) { return folder->GetPath() == path; });
}

void FolderMgr::Upsert(std::shared_ptr<Folder>& change, std::shared_ptr<Folder> folder) {
  FolderLookup& lookup = ByFullPath();
  const std::string share = folder->GetShare();
  const std::string* full_path = lookup.FullPathOf(*folder);
  if (full_path == nullptr) throw Error(Error::kNoSuchShare, share);  // logged when the share was looked up
  change = DiffCfg(folder, GetMostSuitableCfg(*full_path));
  Remove(folder->GetPath(), *full_path);
  lookup.by_full_path.Insert(*full_path, folder);
  folders_.push_back(std::move(folder));
  // After the change, since replacing an entry of a full list is no more than before.
  FERROX_FAIL_IF(folders_.size() > kFileIndexFoldersMax, Error::kTooManyFolders);
}

void FolderMgr::Delete(std::shared_ptr<Folder>& change, const std::string& path) {
  std::shared_ptr<Folder> before;
  Get(before, path);
  const std::string* full_path = ByFullPath().FullPathOf(*before);
  Remove(path, full_path != nullptr ? *full_path : std::string());
  change = DiffCfg(before, full_path != nullptr ? GetMostSuitableCfg(*full_path) : nullptr);
}

void FolderMgr::Remove(const std::string& path, const std::string& full_path) {
  (void)std::erase_if(folders_, [&path](const auto& folder) { return folder->GetPath() == path; });
  if (lookup_->by_full_path.Find(full_path) == nullptr) return;
  lookup_->by_full_path.Erase(full_path);
  (void)lookup_->Fill(folders_);  // another entry of the same full path governs now
}

void FolderMgr::DeleteByShare(const std::string& share) {
  const auto is_of_share = [&share](const auto& folder) { return IsOfShare(*folder, share); };
  (void)std::erase_if(folders_, is_of_share);
  if (lookup_ == nullptr) return;
  lookup_->by_full_path.EraseIf(is_of_share);
  (void)lookup_->Fill(folders_);
}

void FolderMgr::List(std::vector<std::shared_ptr<Folder>>& out, unsigned int& total, unsigned int offset,
                     unsigned int limit, const std::string& sort_by, const std::string& sort_direction) const {
  out = folders_;
  total = static_cast<unsigned int>(out.size());
  SortFolders(out, sort_by);
  if (sort_direction == "desc") std::reverse(out.begin(), out.end());
  (void)out.erase(out.begin(), out.begin() + std::min(offset, total));
  if (out.size() > limit) out.resize(limit);
}

std::shared_ptr<Folder> FolderMgr::GetMostSuitableCfg(const std::string& full_path) const {
  const std::shared_ptr<Folder>* folder = Governing(ByFullPath().by_full_path, full_path);
  return folder != nullptr ? *folder : nullptr;
}

std::shared_ptr<Folder> FolderMgr::DiffCfg(std::shared_ptr<Folder> a, std::shared_ptr<Folder> b) {
  const auto differs = [&a, &b](Flag flag) { return b == nullptr || (a.get()->*flag)() != (b.get()->*flag)(); };
  return newClass<Folder>(a->GetPath(), a->GetName(), differs(&Folder::IsDocument), differs(&Folder::IsAudio),
                          differs(&Folder::IsVideo), differs(&Folder::IsPhoto), false, false);
}

bool FolderMgr::IsFullPathIndexed(const std::string& full_path) const {
  return GetMostSuitableCfg(full_path) != nullptr;
}

bool FolderMgr::IsFullPathHasOwnCfg(const std::string& full_path) const {
  return ByFullPath().by_full_path.Find(full_path) != nullptr;
}

bool FolderMgr::IsFullPathNeedMeta(const std::string& full_path) const {
  const std::shared_ptr<Folder> folder = GetMostSuitableCfg(full_path);
  return folder != nullptr && WantsContent(KindsOf(*folder), full_path);
}

bool FolderMgr::IsShareIndexed(const std::string& share) const {
  return std::any_of(folders_.begin(), folders_.end(),
                     [&share](const auto& folder) { return IsOfShare(*folder, share); });
}

std::set<std::string> FolderMgr::GetIndexedShares() const {
  std::set<std::string> shares;
  for (const auto& folder : folders_) {
    if (HasShare(*folder)) shares.insert(folder->GetShare());
  }
  return shares;
}

}  // namespace ferrox::fileindex
