#define FERROX_SOURCE "index_mgr"

#include "fileindex/operations/operation_steps.h"

#include <syslog.h>
#include <unistd.h>

#include <utility>

#include "common/log.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/operations/folder_patterns.h"
#include "fileindex/operations/related_services.h"

namespace ferrox::fileindex {

void OperationSteps::Add(std::string what, Subject about, std::function<void()> run) {
  steps_.push_back({{std::move(what), std::move(about)}, std::move(run)});
}

void OperationSteps::AddOfShare(const std::string& what, const std::string& share, std::function<void()> run) {
  Add(what + " " + share, {Subject::kShare, share}, std::move(run));
}

void OperationSteps::Run() const {
  for (size_t i = 0; i < steps_.size(); ++i) {
    try {
      steps_[i].run();
    } catch (const Error& failure) {
      throw Stopped(i, failure);
    }
  }
}

OperationError OperationSteps::Stopped(size_t first, const Error& failure) const {
  std::vector<OperationStep> not_done;
  for (size_t i = first; i < steps_.size(); ++i) not_done.push_back(steps_[i].step);
  OperationError stopped(failure, std::move(not_done));
  Log(LOG_ERR, "%s:%d (%d, %u) (%s) Stopped, reason: %s. Not done: %s", ModuleName(FERROX_SOURCE).c_str(), __LINE__,
      getpid(), geteuid(), operation_, failure.what(), stopped.NotDoneText().c_str());
  return stopped;
}

void AddSaveStep(OperationSteps& steps, const FolderMgr& folder_mgr, const std::function<void()>& before) {
  steps.Add("save the folders", {Subject::kFolders, ""}, [&folder_mgr, before] {
    before();
    folder_mgr.Save();
    DropFolderPatterns(folder_mgr);
  });
}

void AddWatchStep(OperationSteps& steps, const std::string& share, const FolderMgr& folder_mgr) {
  steps.AddOfShare("watch the folders of", share, [&] { UpsertKOVANotifydCfg(share, folder_mgr); });
}

void AddStopStep(OperationSteps& steps, const FolderMgr& folder_mgr) {
  if (!folder_mgr.GetFolders().empty()) return;
  steps.Add("stop the services", {Subject::kServices, ""}, [] { SetupRelatedServices(false); });
}

}  // namespace ferrox::fileindex
