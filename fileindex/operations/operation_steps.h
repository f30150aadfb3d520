#pragma once

#include <functional>
#include <string>
#include <vector>

#include "fileindex/operations/operation_error.h"

namespace ferrox::fileindex {

class FolderMgr;

/// The steps of a management operation, in the order in which they are carried out. An operation checks everything
/// first, adds its steps, and runs them last, so that a failed check changes nothing.
class OperationSteps {
 public:
  /// `operation` is the name of the entry point, for the log; it must outlive the object.
  explicit OperationSteps(const char* operation) : operation_(operation) {}

  /// `what` says in the infinitive what `run` does: "save the folders". `about` is what it changes.
  void Add(std::string what, Subject about, std::function<void()> run);
  /// The same for a step of one share: "<what> <share>".
  void AddOfShare(const std::string& what, const std::string& share, std::function<void()> run);

  /// Carries the steps out. When one throws an Error, those before it stay done, those behind it are not begun, and the
  /// log names what is not done. @throws OperationError with the step's code and reason; what is no Error as it comes.
  void Run() const;

 private:
  struct Step {
    OperationStep step;  ///< what a failure says of it
    std::function<void()> run;
  };
  /// Logs that the step `first` and those behind it are not done. @return what Run throws for that.
  OperationError Stopped(size_t first, const Error& failure) const;

  const char* operation_;
  std::vector<Step> steps_;
};

// Steps that several operations take. What is passed must live until the steps are run.

/// FolderMgr::Save, with `before` in front of it; the patterns of folders that are gone go, too.
void AddSaveStep(
    OperationSteps& steps, const FolderMgr& folder_mgr, const std::function<void()>& before = [] {});
/// UpsertKOVANotifydCfg.
void AddWatchStep(OperationSteps& steps, const std::string& share, const FolderMgr& folder_mgr);
/// SetupRelatedServices(false), when no folder is left.
void AddStopStep(OperationSteps& steps, const FolderMgr& folder_mgr);

}  // namespace ferrox::fileindex
