#pragma once

#include <functional>
#include <string>
#include <vector>

namespace ferrox::fileindex {

class FolderMgr;

/// The steps of a management operation, in the order in which they are carried out.
class OperationSteps {
 public:
  /// `operation` is the name of the entry point, for the log.
  explicit OperationSteps(const char* operation) : operation_(operation) {}

  /// `what` says in the infinitive what `run` does: "save the folders".
  void Add(std::string what, std::function<void()> run) { steps_.push_back({std::move(what), std::move(run)}); }

  /// Carries the steps out. What one throws goes on to the caller; those before it stay done, and the log says which
  /// were not.
  void Run() const;

 private:
  struct Step {
    std::string what;
    std::function<void()> run;
  };
  void LogNotDone(size_t first, const char* reason) const;

  const char* operation_;
  std::vector<Step> steps_;
};

// Steps that several operations take. What is passed must live until the steps are run.

/// FolderMgr::Save.
void AddSaveStep(OperationSteps& steps, const FolderMgr& folder_mgr);
/// UpsertKOVANotifydCfg.
void AddWatchStep(OperationSteps& steps, const std::string& share, const FolderMgr& folder_mgr);
/// SetupRelatedServices(false), when no folder is left.
void AddStopStep(OperationSteps& steps, const FolderMgr& folder_mgr);

}  // namespace ferrox::fileindex
