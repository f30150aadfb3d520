#define FERROX_SOURCE "index_mgr"

#include "fileindex/operations/related_services.h"

#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <vector>

#include <json/value.h>

#include <kova/error.h>
#include <kova/file_index.h>
#include <kova/notifyd.h>
#include <kova/samba.h>
#include <kova/service.h>

#include "common/communication.h"
#include "common/log.h"
#include "common/new_class.h"
#include "common/sdk_mutex.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/index_mgr.h"
#include "fileindex/operations/watch_list.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

namespace {

using KOVA::KOVANOTIFYD::MONITOR_QUEUE_TYPE_APPLICATION;
using KOVA::KOVANOTIFYD::MonitorQueue;

constexpr char kContentExtractd[] = "kovacontentextractd";
constexpr char kFileIndexd[] = "pkg-Ferrox-fileindexd";
constexpr char kFileSharing[] = "samba";

/// The platform's last failure: its code and where in the platform it arose.
std::string PlatformError() {
  char code[16];
  (void)snprintf(code, sizeof(code), "0x%04X", static_cast<unsigned>(KLIBCErrGet()));
  return std::string("err=[") + code + " " + KLIBCErrorGetFile() + ":" + std::to_string(KLIBCErrorGetLine()) + "]";
}

/// Whether the platform's `call` succeeded; says so in the log when not.
bool CallSucceeds(int result, const char* call, int line = __builtin_LINE()) {
  if (result >= 0) return true;
  Log(LOG_ERR, "%s:%d (%d, %u) (%s) %s failed: %s", ModuleName(FERROX_SOURCE).c_str(), line, getpid(), geteuid(),
      "SetupRelatedServices", call, PlatformError().c_str());
  return false;
}

/// Logs the failure line of a service that could not be switched.
void ReportSwitch(int result, const char* condition, int line = __builtin_LINE()) {
  if (result < 0) LogFailure({FERROX_SOURCE, line, "SetupRelatedServices", condition}, errno, PlatformError());
  errno = 0;
}

/// Spotlight: searches through the file-sharing service, which is restarted only when that is switched.
void SetupSpotlight(bool enable) {
  if ((KOVASMBIsEnableSpotlight() != 0) == enable) return;
  if (!CallSucceeds(KOVASMBSetSpotlight(enable ? 1 : 0), "KOVASMBSetSpotlight")) return;
  (void)CallSucceeds(KLIBServiceRestart(kFileSharing), "KLIBServiceRestart");
}

/// Whether the path names something that "rm -rf" may be given: an absolute path that ends in a name.
bool IsRemovable(const std::string& path) {
  const std::string name = Basename(path);
  return StringStartWith(path, "/") && !name.empty() && name != "." && name != "..";
}

/// Where the index of the share with that folder lies; "" when the platform cannot say.
std::string ComposeDBPath(const std::string& share_path) {
  const LockMutex guard(sdk::SDKMutex());
  char path[PATH_MAX] = {};
  return 0 > FILEIDXDBPathCompose(share_path.c_str(), path, sizeof(path)) ? std::string() : path;
}

/// Removes what lies at `path`, whatever it is; a failure shows when the place is used again.
void Remove(const std::string& path) { (void)KLIBCExec("/bin/rm", "-rf", path.c_str(), static_cast<char*>(nullptr)); }

Json::Value ShareParameter(const std::string& share) {
  Json::Value parameter(Json::objectValue);
  parameter["share_name"] = share;
  return parameter;
}

}  // namespace

bool IsShareKnown(const std::string& share) {
  try {
    const sdk::SDKShare known(share);
    return true;
  } catch (const Error&) {
    // A platform that fails must not look like a share that has gone.
    if (KLIBCErrGet() != KOVA_ERR_NO_SUCH_SHARE) throw;
    return false;
  }
}

void SetupRelatedServices(bool enable) {
  errno = 0;
  SetupSpotlight(enable);
  errno = 0;
  if (enable) {
    ReportSwitch(KLIBServiceStart(kContentExtractd, 1), R"(0 > KLIBServiceStart("kovacontentextractd", TRUE))");
    ReportSwitch(KLIBServicectlStart(kFileIndexd, KLIB_SERVICECTL_UPSTART),
                 R"(0 > KLIBServicectlStart("pkg-Ferrox-fileindexd", KLIB_SERVICECTL_UPSTART))");
  } else {
    ReportSwitch(KLIBServiceStop(kContentExtractd, 0), R"(0 > KLIBServiceStop("kovacontentextractd", FALSE))");
    ReportSwitch(KLIBServicectlStop(kFileIndexd, KLIB_SERVICECTL_UPSTART),
                 R"(0 > KLIBServicectlStop("pkg-Ferrox-fileindexd", KLIB_SERVICECTL_UPSTART))");
  }
}

void PrepareServices() { SetupRelatedServices(!FolderMgr().GetFolders().empty()); }

void UpsertKOVANotifydCfg(const std::string& share_name, const FolderMgr& folder_mgr) {
  const sdk::SDKShare share(share_name);
  const MonitorQueue monitor_queue(WatchListOf(share_name, share.GetQueuePath(), folder_mgr));
  FERROX_FAIL_IF(!MonitorQueue::Upsert(monitor_queue, kAppName, MONITOR_QUEUE_TYPE_APPLICATION), Error::kInternal,
                 "MonitorQueue::Upsert failed, share=" + share_name, Subject{Subject::kWatching, share_name});
}

void DeleteKOVANotifydCfg(const std::string& share_name) {
  const sdk::SDKShare share(share_name);
  FERROX_FAIL_IF(!MonitorQueue::Delete(share.GetQueuePath(), kAppName, MONITOR_QUEUE_TYPE_APPLICATION),
                 Error::kInternal, "MonitorQueue::Delete failed, share=" + share_name,
                 Subject{Subject::kWatchingEnd, share_name});
}

void CleanShareIndexData(const std::string& share, const std::string& share_path) {
  const std::string queue_path = ComposeQueuePath(share_path);
  FERROX_FAIL_IF_AS(!IsRemovable(queue_path),
                    "0 > FILEIDXQueuePathCompose(share_path.c_str(), queue_path, sizeof(queue_path))", Error::kInternal,
                    "FILEIDXQueuePathCompose failed, share_path=" + share_path,
                    Subject{Subject::kQueuePlace, share_path});
  Remove(queue_path);
  Remove(DetachedQueuePath(queue_path));
  const std::string db_path = ComposeDBPath(share_path);
  FERROX_FAIL_IF_AS(!IsRemovable(db_path), "0 > FILEIDXDBPathCompose(share_path.c_str(), db_path, sizeof(db_path))",
                    Error::kInternal, "FILEIDXDBPathCompose failed, share_path=" + share_path,
                    Subject{Subject::kIndexPlace, share_path});
  Remove(db_path);
  newClass<StatusMgr>()->ClearShareStatus(share);
}

void CreateShareIndex(const std::string& share) {
  try {
    return elastic::ShareIndexCreate(share);
  } catch (const Error& error) {
    if (error.Code() != Error::kEngineIndexExists) throw;
    Log(LOG_WARNING, "the index of share [%s] lies elsewhere, it is made anew", share.c_str());
  }
  DeleteShareIndex(share);
  elastic::ShareIndexCreate(share);
}

void DeleteShareIndex(const std::string& share) {
  try {
    elastic::ShareIndexDelete(share);
  } catch (const Error& error) {
    if (error.Code() != Error::kEngineNoSuchIndex) throw;
    Log(LOG_WARNING, "the engine has no index of share [%s], nothing to delete", share.c_str());
  }
}

void NotifySettingChanged(const std::string& share, bool is_upsert) {
  Json::Value parameter = ShareParameter(share);
  parameter["is_upsert"] = is_upsert;
  SendCommandToDaemon("notify_setting_changed", parameter);
}

void CreateWorker(const std::string& share) { SendCommandToDaemon("worker_create", ShareParameter(share)); }

void DeleteWorker(const std::string& share) { SendCommandToDaemon("worker_delete", ShareParameter(share)); }

void UpdateTermSuggestion(const std::vector<std::string>& db_names) {
  for (const std::string& share_name : FolderMgr().GetIndexedShares()) {
    const sdk::SDKShare share(share_name);
    const std::string db_name = share.GetDBName();
    if (std::find(db_names.begin(), db_names.end(), db_name) == db_names.end()) continue;
    std::vector<std::string> ids;
    elastic::IndexGetByPrefixPath(db_name, share.GetPath(), ids);
    elastic::UpdateTermSuggestion(db_name, ids);
    elastic::IndexCommit(share_name);
  }
}

}  // namespace ferrox::fileindex
