#include "base/log_sink.h"

#include <syslog.h>

#include <cerrno>

#include "base/text.h"

namespace base {

void LogSink::WriteToSystem(int priority, const char* line) { syslog(priority, "%s", line); }

void LogSink::Write(int priority, std::string_view line) const {
  const int saved_errno = errno;
  function_.load()(priority, WithoutControls(line, "\\x%02x").c_str());
  errno = saved_errno;
}

LogSink::Function LogSink::Set(Function function) {
  return function_.exchange(function != nullptr ? function : &WriteToSystem);
}

}  // namespace base
