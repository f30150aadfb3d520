#define FERROX_SOURCE "index_mgr"
#include <cxxabi.h>
#include <syslog.h>

#include <exception>
#include <set>

#include <json/value.h>

#include "common/json_util.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "common/new_class.h"
#include "common/paths.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/folders/folder_status.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/operations/operation_steps.h"
#include "fileindex/operations/related_services.h"
#include "fileindex/queue/custom_event.h"
#include "fileindex/queue/event.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

namespace {

using Changes = std::vector<std::shared_ptr<Folder>>;

/// The change that FolderAdd announces for a new folder: all kinds, whichever are on in it and whatever governed it
/// before, so that the daemon compares all of it.
std::shared_ptr<Folder> WithAllKinds(const Folder& folder) {
  return newClass<Folder>(folder.GetPath(), folder.GetName(), true, true, true, true, false, false);
}

/// Has the index daemon compare with the index what of these folders has changed, in their order.
void QueueChanges(const Changes& changes) {
  CustomEventWriter events;
  for (const std::shared_ptr<Folder>& change : changes) {
    events.Add(EVENT_UPDATE_CFG, change->GetFullPath(), "", change->GetIndexCfg());
  }
}

/// The name of the step that queues the changes.
std::string QueueingOf(const Changes& changes) {
  return "queue the changes of " + std::to_string(changes.size()) + " folders";
}

/// Has the index daemon look again at what it is to do for each of the shares: make, keep or end its worker.
void AddNotifySteps(OperationSteps& steps, const std::set<std::string>& shares, bool is_upsert) {
  for (const std::string& share : shares) {
    steps.AddOfShare("tell the index daemon of", share,
                     [&share, is_upsert] { NotifySettingChanged(share, is_upsert); });
  }
}

/// FolderAdd and FolderSet. Everything is checked and put into `folder_mgr`, which is memory, before the first step;
/// the folder lock keeps others from changing the file meanwhile. An index and its watches come before the file is
/// saved: a folder that is in the file can be worked on. The events come last, when the daemon knows the new folders.
void FolderUpsert(const Json::Value& folder_list, bool create, bool updater_mode) {
  const LockFile lock(InstancePath(kFolderLockPath), true);
  FolderMgr folder_mgr;
  const FolderMgr before;
  FERROX_FAIL_IF_AS(!IsJsonArray(folder_list), "!folder_list.isArray()", Error::kBadArgument, toString(folder_list));
  Changes changes;
  std::set<std::string> shares;
  for (const Json::Value& element : folder_list) {
    const auto folder_new = newClass<Folder>(element);
    FERROX_FAIL_IF_AS(!updater_mode && !CanPathBeIndexed(folder_new->GetPath()),
                      "!CanPathBeIndexed(folder_new->GetPath()) && !updater_mode", Error::kPathNotIndexable,
                      "Path cannot index: " + folder_new->GetPath(), Subject{Subject::kFolder, folder_new->GetPath()});
    FERROX_FAIL_IF(create && folder_mgr.HasFolder(folder_new->GetPath()), Error::kDuplicatedFolder,
                   "Duplicated ID: " + folder_new->GetPath());
    std::shared_ptr<Folder> diff;
    folder_mgr.Upsert(diff, folder_new);
    changes.push_back(create ? WithAllKinds(*folder_new) : diff);
    const sdk::SDKShare share(folder_new->GetShare());
    FERROX_FAIL_IF(!share.IsSpaceEnough(), Error::kSpaceNotEnough, "Share (" + share.GetName() + ") space not enough");
    shares.insert(share.GetName());
  }

  // Nothing was changed so far.
  OperationSteps steps(create ? "FolderAdd" : "FolderSet");
  steps.Add("start the services", {Subject::kServices, ""}, [] { SetupRelatedServices(true); });
  for (const std::string& share : shares) {
    if (create && !before.IsShareIndexed(share)) {
      steps.AddOfShare("create the index of", share, [&share] { CreateShareIndex(share); });
    }
    AddWatchStep(steps, share, folder_mgr);
  }
  AddSaveStep(steps, folder_mgr);
  AddNotifySteps(steps, shares, true);
  if (!updater_mode) steps.Add(QueueingOf(changes), {Subject::kFolders, ""}, [&changes] { QueueChanges(changes); });
  steps.Run();
}

/// Undoes what indexing a share has made, once no folder of it is left.
void AddForgetSteps(OperationSteps& steps, const std::string& share) {
  const bool known = IsShareKnown(share);
  steps.AddOfShare("delete the index of", share, [&share] { DeleteShareIndex(share); });
  if (!known) {
    Log(LOG_WARNING, "share [%s] is gone, and with it where its queue and its index were", share.c_str());
    steps.AddOfShare("clear the status of", share, [&share] { newClass<StatusMgr>()->ClearShareStatus(share); });
    return;
  }
  steps.AddOfShare("stop watching", share, [&share] { DeleteKOVANotifydCfg(share); });
  steps.AddOfShare("remove the index data of", share,
                   [&share] { CleanShareIndexData(share, sdk::SDKShare(share).GetPath()); });
}

/// Makes the index of the share anew, empty, and has everything indexed again.
void RebuildShare(const std::string& share_name) {
  const sdk::SDKShare share(share_name);
  DeleteShareIndex(share_name);
  elastic::ShareIndexCreate(share_name);
  AddCustomEvent(EVENT_REINDEX, share.GetPath(), "", Json::Value());
}

/// Appends the folder to a page; one whose state cannot be found out is left out.
void AppendFolder(Json::Value& page, FolderStatus& status, const Folder& folder, const Json::Value& additional) {
  try {
    page.append(status.GetDataWithAdditional(folder, additional));
  } catch (const abi::__forced_unwind&) {
    throw;  // the thread is being cancelled
  } catch (const std::exception& error) {
    Log(LOG_WARNING, "folder [%s] left out of the list, reason: %s", folder.GetPath().c_str(), error.what());
  } catch (...) {
    Log(LOG_WARNING, "folder [%s] left out of the list", folder.GetPath().c_str());
  }
}

}  // namespace

void FolderAdd(const Json::Value& folder_list, bool updater_mode) { FolderUpsert(folder_list, true, updater_mode); }

void FolderSet(const Json::Value& folder_list, bool updater_mode) { FolderUpsert(folder_list, false, updater_mode); }

void FolderReindex(const Json::Value& path_list) {
  const StatusMgr status_mgr;
  const FolderMgr folder_mgr;
  FERROX_FAIL_IF_AS(!IsJsonArray(path_list), "!path_list.isArray()", Error::kBadArgument, toString(path_list));
  std::set<std::string> to_rebuild;
  std::set<std::string> shares;
  CustomEventWriter events;  // queues at once; what an element throws later takes nothing back
  for (const Json::Value& it : path_list) {
    FERROX_FAIL_IF(!it.isString(), Error::kBadArgument, toString(it));
    const std::string share = GetShareNameByPath(it.asString());
    if (!folder_mgr.IsShareIndexed(share)) continue;
    if ((status_mgr.GetShareStatus(share) & StatusMgr::kSecondCondition) != 0) {
      to_rebuild.insert(share);
    } else {
      events.Add(EVENT_REINDEX, GetFullPath(it.asString()), "", Json::Value());
    }
    shares.insert(share);
  }

  OperationSteps steps(__func__);
  for (const std::string& share : to_rebuild) {
    steps.AddOfShare("rebuild the index of", share, [&share] { RebuildShare(share); });
  }
  for (const std::string& share : shares) {
    // Deliberate: the second condition alone stays; it goes only together with the first.
    if ((status_mgr.GetShareStatus(share) & StatusMgr::kNeedReindex) == 0) continue;
    steps.AddOfShare("clear the status of", share, [&share] {
      newClass<StatusMgr>()->UnsetShareStatus(share, StatusMgr::kNeedReindex | StatusMgr::kSecondCondition);
    });
  }
  steps.Run();
}

void FolderDelete(const Json::Value& path_list) {
  const LockFile lock(InstancePath(kFolderLockPath), true);
  FolderMgr folder_mgr;
  FERROX_FAIL_IF_AS(!IsJsonArray(path_list), "!path_list.isArray()", Error::kBadArgument, toString(path_list));
  Changes removed;
  std::set<std::string> shares;
  for (const Json::Value& it : path_list) {
    FERROX_FAIL_IF(!it.isString(), Error::kBadArgument, toString(it));
    std::shared_ptr<Folder> change;
    folder_mgr.Delete(change, it.asString());
    if (!StringStartWith(change->GetPath(), "/")) continue;  // of no share: nothing followed it
    removed.push_back(change);
    shares.insert(change->GetShare());
  }

  // A share that has folders left, and is there, is compared where they went; one that has none left loses everything.
  OperationSteps steps(__func__);
  Changes to_compare;
  for (const std::string& share : shares) {
    if (!folder_mgr.IsShareIndexed(share)) {
      AddForgetSteps(steps, share);
    } else if (IsShareKnown(share)) {
      AddWatchStep(steps, share, folder_mgr);
    }
  }
  for (const std::shared_ptr<Folder>& change : removed) {
    if (folder_mgr.IsShareIndexed(change->GetShare()) && IsShareKnown(change->GetShare())) to_compare.push_back(change);
  }
  AddSaveStep(steps, folder_mgr);
  AddNotifySteps(steps, shares, false);
  steps.Add(QueueingOf(to_compare), {Subject::kFolders, ""}, [&to_compare] { QueueChanges(to_compare); });
  AddStopStep(steps, folder_mgr);
  steps.Run();
}

void FolderGet(Json::Value& out, const std::string& path) {
  std::shared_ptr<Folder> folder;
  FolderMgr().Get(folder, path);
  out = folder->GetData();
}

void FolderList(Json::Value& out, unsigned int offset, unsigned int limit, const std::string& sort_by,
                const std::string& sort_direction, const Json::Value& additional) {
  std::vector<std::shared_ptr<Folder>> page;
  unsigned int total = 0;
  FolderMgr().List(page, total, offset, limit, sort_by, sort_direction);
  out = Json::Value(Json::objectValue);
  Json::Value& folders = out["folder"] = Json::Value(Json::arrayValue);
  out["total"] = total;
  out["offset"] = offset;
  FolderStatus status(page);
  for (const std::shared_ptr<Folder>& folder : page) AppendFolder(folders, status, *folder, additional);
}

}  // namespace ferrox::fileindex
