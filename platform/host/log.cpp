#include "platform/host/log.h"

#include <syslog.h>

#include <atomic>
#include <cerrno>
#include <map>
#include <mutex>

#include <kova/log.h>

namespace kova::host {

namespace {

std::atomic<LogSink> g_sink{nullptr};

struct Said {
  std::mutex mutex;
  std::map<std::string, std::string> lines;  // by subject
};

Said& WhatWasSaid() {
  static auto* said = new Said;  // never freed: threads may still log at exit
  return *said;
}

}  // namespace

void LogLine(int priority, const std::string& line) {
  const int saved_errno = errno;
  const std::string plain = WithoutControlCharacters(line);
  const LogSink sink = g_sink;
  if (sink != nullptr) {
    sink(priority, plain.c_str());
  } else {
    syslog(priority, "%s", plain.c_str());
  }
  errno = saved_errno;
}

void LogChange(int priority, const std::string& subject, const std::string& line) {
  Said& said = WhatWasSaid();
  const std::lock_guard<std::mutex> guard(said.mutex);
  std::string& last = said.lines[subject];
  if (last == line) return;
  last = line;
  LogLine(priority, line);
}

void SetLogSink(LogSink sink) {
  Said& said = WhatWasSaid();
  const std::lock_guard<std::mutex> guard(said.mutex);
  said.lines.clear();
  g_sink = sink;
}

}  // namespace kova::host
