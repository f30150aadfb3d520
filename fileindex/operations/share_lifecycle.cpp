#define FERROX_SOURCE "index_mgr"
#include <syslog.h>

#include <set>

#include <json/value.h>

#include "base/path.h"
#include "common/log.h"
#include "common/new_class.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/folders/folder_share.h"
#include "fileindex/operations/folder_patterns.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/operations/operation_steps.h"
#include "fileindex/operations/related_services.h"
#include "fileindex/queue/event.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

// How the index follows what the platform does with shares and volumes. None of these takes the folder lock: of two
// that save at the same moment, one wins whole. The order of the steps decides what an operation leaves that stops half
// way.
namespace ferrox::fileindex {

namespace {

constexpr char kRecycleBin[] = "/#recycle";

/// In memory; AddSaveStep stores it.
void SetPausedOfShare(const FolderMgr& folder_mgr, const std::string& share, bool paused) {
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    if (IsOfShare(*folder, share)) folder->SetPaused(paused);
  }
}

/// Whether the folder lies on the volume mounted there. One whose share is gone lies on none. Deliberate: "/" is no
/// volume, so that no request pauses or drops all folders at once.
bool LiesOnVolume(const Folder& folder, const std::string& mount_point) {
  const bool has_share = StringStartWith(folder.GetPath(), "/");
  if (has_share && IsShareKnown(folder.GetShare()))
    return mount_point != "/" && base::IsAtOrBelow(folder.GetFullPath(), mount_point);
  Log(LOG_WARNING, "folder [%s] passed over, its share does not exist", folder.GetPath().c_str());
  return false;
}

/// The worker goes first, since it uses the index; what changes from then on waits in the queue, or is found by the
/// comparison when the share goes on.
void AddPauseSteps(OperationSteps& steps, const std::string& share) {
  steps.AddOfShare("stop the worker of", share, [&share] { DeleteWorker(share); });
  steps.AddOfShare("stop watching", share, [&share] { DeleteKOVANotifydCfg(share); });
  steps.AddOfShare("pause the index of", share, [&share] { elastic::ShareIndexPause(share); });
}

/// The share's folder as it was called before the rename: the last component of its path is its name.
std::string PathBeforeRename(const std::string& path, const std::string& share_to, const std::string& share_from) {
  return Dirname(path) + ReplacePathShare("/" + Basename(path), share_from, share_to);
}

}  // namespace

void ShareRename(const std::string& share_from, const std::string& share_to) {
  FERROX_FAIL_IF(share_from.empty(), Error::kBadArgument, "Missing share_from");
  FERROX_FAIL_IF(share_to.empty(), Error::kBadArgument, "Missing share_to");
  const FolderMgr folder_mgr;
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    if (IsOfShare(*folder, share_from)) folder->SetShare(share_to);
  }
  OperationSteps steps(__func__);
  AddSaveStep(steps, folder_mgr, [&] { CopyFolderPatterns("/" + share_from, "/" + share_to); });
  steps.AddOfShare("rename the index of", share_from,
                   [&] { elastic::ShareIndexRename(share_from, share_to, sdk::SDKShare(share_to).GetDBPath()); });
  steps.AddOfShare("queue the rename of", share_from, [&] {
    const std::string path = sdk::SDKShare(share_to).GetPath();
    AddCustomEvent(EVENT_RENAME, path, PathBeforeRename(path, share_to, share_from), Json::Value());
  });
  steps.Run();
}

void ShareMigrate(const std::string& share_name, const std::string& path_from, const std::string& path_to) {
  FERROX_FAIL_IF(share_name.empty(), Error::kBadArgument, "Missing share_name");
  FERROX_FAIL_IF(path_from.empty(), Error::kBadArgument, "Missing path_from");
  FERROX_FAIL_IF(path_to.empty(), Error::kBadArgument, "Missing path_to");
  if (!FolderMgr().IsShareIndexed(share_name)) return;
  OperationSteps steps(__func__);
  steps.AddOfShare("move the index of", share_name,
                   [&] { elastic::ShareIndexMigrate(share_name, sdk::SDKShare(share_name).GetDBPath()); });
  steps.AddOfShare("queue the move of", share_name,
                   [&] { AddCustomEvent(EVENT_RENAME, path_to, path_from, Json::Value()); });
  steps.Run();
}

void SharePause(const std::string& share_name) {
  FERROX_FAIL_IF(share_name.empty(), Error::kBadArgument, "Missing share name");
  const FolderMgr folder_mgr;
  if (!folder_mgr.IsShareIndexed(share_name)) return;
  OperationSteps steps(__func__);
  AddPauseSteps(steps, share_name);
  SetPausedOfShare(folder_mgr, share_name, true);
  AddSaveStep(steps, folder_mgr);
  steps.Run();
}

void ShareResume(const std::string& share_name) {
  FERROX_FAIL_IF(share_name.empty(), Error::kBadArgument, "Missing share name");
  const FolderMgr folder_mgr;
  if (!folder_mgr.IsShareIndexed(share_name)) return;
  OperationSteps steps(__func__);
  steps.AddOfShare("resume the index of", share_name, [&] { elastic::ShareIndexResume(share_name); });
  AddWatchStep(steps, share_name, folder_mgr);
  steps.AddOfShare("start the worker of", share_name, [&] { CreateWorker(share_name); });
  SetPausedOfShare(folder_mgr, share_name, false);
  AddSaveStep(steps, folder_mgr);
  steps.Run();
}

void ShareClearPaused(const std::string& share_name, const std::string& share_path) {
  FERROX_FAIL_IF(share_name.empty(), Error::kBadArgument, "Missing share name");
  FERROX_FAIL_IF(share_path.empty(), Error::kBadArgument, "Missing share path");
  FolderMgr folder_mgr;
  OperationSteps steps(__func__);
  steps.AddOfShare("remove the index data of", share_name, [&] { CleanShareIndexData(share_name, share_path); });
  steps.AddOfShare("delete the index of", share_name, [&] { DeleteShareIndex(share_name); });
  folder_mgr.DeleteByShare(share_name);
  AddSaveStep(steps, folder_mgr);
  AddStopStep(steps, folder_mgr);
  steps.Run();
}

void ShareCheckRecycle(const std::string& share_name) {
  const std::string path = sdk::SDKShare(share_name).GetPath();
  if (!IsDirExist(path, false)) return;
  AddCustomEvent(EVENT_REINDEX, path + kRecycleBin, "", Json::Value());
}

void VolumePause(const std::string& mount_point) {
  FERROX_FAIL_IF(mount_point.empty(), Error::kBadArgument, "Missing mount point");
  const FolderMgr folder_mgr;
  std::set<std::string> shares;
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    if (!LiesOnVolume(*folder, mount_point)) continue;
    folder->SetPaused(true);
    folder->SetVolumeToBeClean(mount_point);
    shares.insert(folder->GetShare());
  }
  OperationSteps steps(__func__);
  AddSaveStep(steps, folder_mgr);
  for (const std::string& share : shares) AddPauseSteps(steps, share);
  steps.Run();
}

void VolumeResume(const std::string& mount_point) {
  FERROX_FAIL_IF(mount_point.empty(), Error::kBadArgument, "Missing mount point");
  const FolderMgr folder_mgr;
  std::set<std::string> shares;
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    if (!folder->IsPaused() || !LiesOnVolume(*folder, mount_point)) continue;
    // Deliberate: the volume to be cleaned stays named.
    folder->SetPaused(false);
    shares.insert(folder->GetShare());
  }
  OperationSteps steps(__func__);
  AddSaveStep(steps, folder_mgr);
  for (const std::string& share : shares) {
    steps.AddOfShare("resume the index of", share, [&share] { elastic::ShareIndexResume(share); });
    steps.AddOfShare("start the worker of", share, [&share] { CreateWorker(share); });
    AddWatchStep(steps, share, folder_mgr);
  }
  steps.Run();
}

void VolumeClearPaused(const std::string& mount_point) {
  FERROX_FAIL_IF(mount_point.empty(), Error::kBadArgument, "Missing mount point");
  FolderMgr folder_mgr;
  const auto status_mgr = newClass<StatusMgr>();
  std::set<std::string> shares;
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    if (folder->IsPaused() && folder->GetVolumeToBeClean() == mount_point) shares.insert(folder->GetShare());
  }
  OperationSteps steps(__func__);
  for (const std::string& share : shares) {
    folder_mgr.DeleteByShare(share);
    steps.AddOfShare("clear the status of", share, [&] { status_mgr->ClearShareStatus(share); });
  }
  AddSaveStep(steps, folder_mgr);
  AddStopStep(steps, folder_mgr);
  steps.Run();
}

}  // namespace ferrox::fileindex
