#define FERROX_SOURCE "index_mgr"

#include "fileindex/operations/operation_steps.h"

#include <syslog.h>
#include <unistd.h>

#include "common/error.h"
#include "common/log.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/related_services.h"

namespace ferrox::fileindex {

void OperationSteps::Run() const {
  for (size_t i = 0; i < steps_.size(); ++i) {
    try {
      steps_[i].run();
    } catch (const Error& error) {
      LogNotDone(i, error.what());
      throw;
    }
  }
}

void OperationSteps::LogNotDone(size_t first, const char* reason) const {
  std::string not_done;
  for (size_t i = first; i < steps_.size(); ++i) not_done += (i == first ? "" : "; ") + steps_[i].what;
  Log(LOG_ERR, "%s:%d (%d, %u) (%s) Stopped, reason: %s. Not done: %s", ModuleName(FERROX_SOURCE).c_str(), __LINE__,
      getpid(), geteuid(), operation_, reason, not_done.c_str());
}

void AddSaveStep(OperationSteps& steps, const FolderMgr& folder_mgr) {
  steps.Add("save the folders", [&folder_mgr] { folder_mgr.Save(); });
}

void AddWatchStep(OperationSteps& steps, const std::string& share, const FolderMgr& folder_mgr) {
  steps.Add("watch the folders of " + share, [&] { UpsertKOVANotifydCfg(share, folder_mgr); });
}

void AddStopStep(OperationSteps& steps, const FolderMgr& folder_mgr) {
  if (folder_mgr.GetFolders().empty()) steps.Add("stop the services", [] { SetupRelatedServices(false); });
}

}  // namespace ferrox::fileindex
