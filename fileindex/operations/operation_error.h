#pragma once

#include <string>
#include <vector>

#include "common/export.h"
#include "common/subject_error.h"

namespace ferrox::fileindex {

/// A step of a management operation that was not carried out. Its text is for people and for the log, where the names
/// of shares stand as they are; programs use `about`.
struct OperationStep {
  std::string what;  ///< in the infinitive: "save the folders", "stop the worker of photo"
  Subject about;     ///< the share, user or list that it would have changed
};

/// How a management operation (index_mgr.h) fails once it has begun to change something. Code, reason and About() are
/// those of the call that failed. What stood before the failed step is done and stays; an operation that fails before
/// its first step throws a plain Error, or a SubjectError, and has changed nothing. Callers to whom that makes no
/// difference catch Error.
///   try {
///     FolderDelete(paths);
///   } catch (const OperationError& error) {
///     Show("not done: " + error.NotDoneText());
///   }
class FERROX_EXPORT OperationError : public SubjectError {
 public:
  /// `not_done` begins with the step that `failure` ended.
  /// A subject that `failure` has is kept.
  OperationError(const Error& failure, std::vector<OperationStep> not_done);
  OperationError(const OperationError&) = default;
  OperationError& operator=(const OperationError&) = default;
  ~OperationError() override;

  /// The step that failed and all behind it, in their order; never empty.
  const std::vector<OperationStep>& NotDone() const noexcept { return not_done_; }
  /// The same for people: "save the folders; watch the folders of photo".
  std::string NotDoneText() const;

 private:
  std::vector<OperationStep> not_done_;
};

}  // namespace ferrox::fileindex
