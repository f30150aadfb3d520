#include "platform/shared/failure.h"

#include <cerrno>
#include <cstring>

namespace kova {

namespace {

struct Failure {
  int code = KOVA_ERR_NONE;
  const char* file = "";
  int line = 0;
};

thread_local Failure t_failure;

}  // namespace

int SetFailure(int code, const char* file, int line) noexcept {
  const char* slash = strrchr(file, '/');
  t_failure = {code, slash != nullptr ? slash + 1 : file, line};
  return -1;
}

int SystemFailureCode() noexcept {
  if (errno == ENOSPC) return KOVA_ERR_OUT_OF_SPACE;
  if (errno == EDQUOT) return KOVA_ERR_OVER_QUOTA;
  return KOVA_ERR_SYSTEM;
}

}  // namespace kova

int KLIBCErrGet(void) { return kova::t_failure.code; }
const char* KLIBCErrorGetFile(void) { return kova::t_failure.file; }
int KLIBCErrorGetLine(void) { return kova::t_failure.line; }
