#include "common/error.h"

namespace ferrox {

namespace {

std::string Compose(Error::ErrorCode code, const std::string& reason) {
  std::string text = "Ferrox error, code=" + std::to_string(static_cast<int32_t>(code));
  if (!reason.empty()) text += ", reason=[" + reason + "]";
  return text;
}

}  // namespace

Error::Error(ErrorCode code) : Error(code, {}) {}
Error::Error(ErrorCode code, const std::string& reason)
    : std::runtime_error(Compose(code, reason)), code_(code), reason_(reason) {}
Error::~Error() = default;

const char* Error::what() const noexcept { return reason_.c_str(); }

}  // namespace ferrox
