#include "common/log.h"

#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "base/log_sink.h"

namespace ferrox {

namespace {

constexpr size_t kLineMaxBytes = 8192;

constinit base::LogSink g_sink;

}  // namespace

void Log(int priority, const char* format, ...) {
  const int saved_errno = errno;
  char line[kLineMaxBytes];
  va_list arguments;
  va_start(arguments, format);
  const int length = vsnprintf(line, sizeof(line), format, arguments);
  va_end(arguments);
  const size_t used = length < 0 ? 0 : std::min(static_cast<size_t>(length), sizeof(line) - 1);
  g_sink.Write(priority, {line, used});
  errno = saved_errno;
}

LogSink SetLogSink(LogSink sink) { return g_sink.Set(sink); }

std::string ModuleName(const char* file) {
  const char* slash = strrchr(file, '/');
  const char* start = slash != nullptr ? slash + 1 : file;
  return {start, strcspn(start, ".")};
}

void LogFailure(const FailSite& site, int saved_errno, const std::string& reason) {
  const std::string module = ModuleName(site.file);
  errno = saved_errno;
  Log(LOG_ERR, "%s:%d (%d, %u) (%s) Failed [%s], reason: %s%s", module.c_str(), site.line, getpid(), geteuid(),
      site.function, site.condition, reason.c_str(), ErrnoSuffix().c_str());
  errno = saved_errno;
}

void Fail(const FailSite& site, int saved_errno, Error::ErrorCode code, const std::string& reason) {
  LogFailure(site, saved_errno, reason);
  throw Error(code, reason);
}

void Fail(const FailSite& site, int saved_errno, Error::ErrorCode code, const std::string& reason,
          const Subject& subject) {
  LogFailure(site, saved_errno, reason);
  throw SubjectError(code, reason, subject);
}

std::string ErrnoSuffix() { return errno == 0 ? std::string() : " [err: " + ErrnoText() + "]"; }

std::string ErrnoText() {
  char buffer[256];
  return strerror_r(errno, buffer, sizeof(buffer));
}

}  // namespace ferrox
