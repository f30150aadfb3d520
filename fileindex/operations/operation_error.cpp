#include "fileindex/operations/operation_error.h"

#include <utility>

namespace ferrox::fileindex {

OperationError::OperationError(const Error& failure, std::vector<OperationStep> not_done)
    : SubjectError(failure.Code(), failure.what(), Of(failure)), not_done_(std::move(not_done)) {}
OperationError::~OperationError() = default;

std::string OperationError::NotDoneText() const {
  std::string text;
  for (const OperationStep& step : not_done_) text += (text.empty() ? "" : "; ") + step.what;
  return text;
}

}  // namespace ferrox::fileindex
