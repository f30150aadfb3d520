#pragma once

#include <kova/error.h>

namespace kova {

/// Records the details of this thread's failure (kova/error.h). Keeps errno.
/// @return -1, the result of most calls that fail.
int SetFailure(int code, const char* file, int line) noexcept;

/// The code for the present errno: lack of space or quota is told apart from every other system failure.
int SystemFailureCode() noexcept;

}  // namespace kova

#define KOVA_FAIL(code) ::kova::SetFailure(code, __FILE__, __LINE__)
#define KOVA_FAIL_ERRNO() KOVA_FAIL(::kova::SystemFailureCode())
