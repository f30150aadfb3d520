#pragma once

#include <string>

namespace kova::host {

/// Writes one line to the system's log; `priority` is one of syslog's. Control characters are escaped. Keeps errno.
void LogLine(int priority, const std::string& line);

/// The same, unless the line is the one that this process logged last about `subject`: what stays as it is is said
/// once. Safe for threads.
void LogChange(int priority, const std::string& subject, const std::string& line);

/// Takes the lines in place of the system's log, for tests; null restores it. Forgets what LogChange has said.
using LogSink = void (*)(int priority, const char* line);
void SetLogSink(LogSink sink);

}  // namespace kova::host
