#pragma once

#include <algorithm>
#include <string>
#include <vector>

#include "platform/host/log.h"

namespace ferrox::test {

/// Collects what the host's platform logs while it lives, in place of the system's log. One at a time.
struct HostLog {
  HostLog() {
    lines.clear();
    kova::host::SetLogSink([](int, const char* line) { lines.emplace_back(line); });
  }
  HostLog(const HostLog&) = delete;
  HostLog& operator=(const HostLog&) = delete;
  ~HostLog() { kova::host::SetLogSink(nullptr); }

  /// How many lines hold `text`.
  static long Count(const std::string& text) {
    return std::count_if(lines.begin(), lines.end(), [&](const auto& line) { return line.find(text) != line.npos; });
  }

  static inline std::vector<std::string> lines;
};

}  // namespace ferrox::test
