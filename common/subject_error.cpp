#include "common/subject_error.h"

#include <utility>

namespace ferrox {

SubjectError::SubjectError(ErrorCode code, const std::string& reason, Subject subject)
    : Error(code, reason), subject_(std::move(subject)) {}
SubjectError::~SubjectError() = default;

Subject SubjectError::Of(const Error& error) {
  const auto* with_subject = dynamic_cast<const SubjectError*>(&error);
  return with_subject != nullptr ? with_subject->subject_ : Subject();
}

}  // namespace ferrox
