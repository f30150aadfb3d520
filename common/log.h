#ifndef FERROX_COMMON_LOG_H
#define FERROX_COMMON_LOG_H

#include <string>

#include "common/error.h"
#include "common/export.h"
#include "common/subject_error.h"

namespace ferrox {

/// Takes one finished line of the log; `priority` is one of syslog's. Called by any thread, several at once; the line
/// lives during the call alone. Must not call Log.
using LogSink = void (*)(int priority, const char* line);

/// Writes one line to the log, the system's unless SetLogSink chose another. `%m` stands for errno's text. Control
/// characters are written as \xNN, so that no file name can forge a line; a line is cut at 8 KiB. Keeps errno. Any
/// thread may call it; 8 KiB of its stack are used, and it may block for as long as the sink does.
///   Log(LOG_WARNING, "%s: cannot be read: %m", path.c_str());
FERROX_EXPORT void Log(int priority, const char* format, ...) __attribute__((format(printf, 2, 3)));

/// Replaces the log's sink for the whole process and returns the one before; null restores the system's. Never returns
/// null. A line that another thread is writing meanwhile may still go to the sink before.
FERROX_EXPORT LogSink SetLogSink(LogSink sink);

/// Where a failure was noticed: `file` is the source's path or its module's name, `condition` the failed check as text.
/// The texts are not copied and need live during the call alone; those of the macros below live for ever.
struct FailSite {
  const char* file;
  int line;
  const char* function;
  const char* condition;
};

/// The name of the module that `file` belongs to: its stem, which is "share" for "sdk/share.cpp". No suffix is needed.
FERROX_EXPORT std::string ModuleName(const char* file);

/// Logs "<module>:<line> (<pid>, <euid>) (<function>) Failed [<condition>], reason: <reason>" and, when `saved_errno`
/// is not 0, " [err: <its text>]". errno is `saved_errno` afterwards.
FERROX_EXPORT void LogFailure(const FailSite& site, int saved_errno, const std::string& reason = {});
/// LogFailure, then throws Error(code, reason).
[[noreturn, gnu::cold]] FERROX_EXPORT void Fail(const FailSite& site, int saved_errno, Error::ErrorCode code,
                                                const std::string& reason = {});
/// The same, but throws SubjectError(code, reason, subject).
[[noreturn, gnu::cold]] FERROX_EXPORT void Fail(const FailSite& site, int saved_errno, Error::ErrorCode code,
                                                const std::string& reason, const Subject& subject);

/// " [err: <text of the present errno>]", "" when it is 0: the end of a line that reports a failure.
FERROX_EXPORT std::string ErrnoSuffix();
/// The text of the present errno, for example "No space left on device". Any thread may call it.
FERROX_EXPORT std::string ErrnoText();

}  // namespace ferrox

/// Logs the failure line for `condition` and throws Error(code, reason...) when it holds; with a Subject as the last
/// argument, the SubjectError of it. The line shows `text`, for conditions that the log names otherwise than the source
/// does. The reason is composed only when the condition holds. errno is that of the condition, also in the line; set it
/// to 0 before where it tells nothing. Sources that use these macros include <cerrno>:
///   FERROX_FAIL_IF(0 > rename(from.c_str(), to.c_str()), Error::kInternal, "rename failed, reason=" + ErrnoText());
#define FERROX_FAIL_IF_AS(condition, text, code, ...)                                                                 \
  do {                                                                                                                \
    if (condition) [[unlikely]] {                                                                                     \
      const int ferrox_saved_errno = errno;                                                                           \
      ::ferrox::Fail({FERROX_SOURCE, __LINE__, __func__, text}, ferrox_saved_errno, code __VA_OPT__(, ) __VA_ARGS__); \
    }                                                                                                                 \
  } while (false)

/// The same, with the condition as it stands in the source. Not for use inside a lambda, whose name is no help in a
/// log.
#define FERROX_FAIL_IF(condition, code, ...) FERROX_FAIL_IF_AS(condition, #condition, code __VA_OPT__(, ) __VA_ARGS__)

#endif  // FERROX_COMMON_LOG_H

/// The name under which this source logs. A module that is cut into several files sets it before its includes. Stands
/// outside of the guard: of sources that are compiled as one, each has its own, and the build undefines it in between.
#ifndef FERROX_SOURCE
#define FERROX_SOURCE __FILE__
#endif
