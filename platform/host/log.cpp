#include "platform/host/log.h"

#include <map>

#include "base/log_sink.h"
#include "base/mutex.h"

namespace kova::host {

namespace {

constinit base::LogSink g_sink;

struct Said {
  base::Mutex mutex;
  std::map<std::string, std::string> lines BASE_GUARDED_BY(mutex);  // by subject
};

Said& WhatWasSaid() {
  static auto* said = new Said;  // never freed: threads may still log at exit
  return *said;
}

}  // namespace

void LogLine(int priority, const std::string& line) { g_sink.Write(priority, line); }

void LogChange(int priority, const std::string& subject, const std::string& line) {
  Said& said = WhatWasSaid();
  const base::MutexLock lock(said.mutex);
  std::string& last = said.lines[subject];
  if (last == line) return;
  last = line;
  LogLine(priority, line);
}

void SetLogSink(LogSink sink) {
  Said& said = WhatWasSaid();
  const base::MutexLock lock(said.mutex);
  said.lines.clear();
  (void)g_sink.Set(sink);
}

}  // namespace kova::host
