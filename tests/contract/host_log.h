#pragma once

#include <algorithm>
#include <string>
#include <vector>

#include "platform/host/log.h"

namespace ferrox::test {

/// Collects what the host's platform logs while it lives, in place of the system's log. One at a time.
class HostLog {
 public:
  HostLog() {
    Lines().clear();
    kova::host::SetLogSink([](int, const char* line) { Lines().emplace_back(line); });
  }
  HostLog(const HostLog&) = delete;
  HostLog& operator=(const HostLog&) = delete;
  ~HostLog() { kova::host::SetLogSink(nullptr); }

  static std::vector<std::string>& Lines() {
    static std::vector<std::string> lines;
    return lines;
  }
  /// How many lines hold `text`.
  static long Count(const std::string& text) {
    return std::count_if(Lines().begin(), Lines().end(),
                         [&](const std::string& line) { return line.find(text) != std::string::npos; });
  }
};

}  // namespace ferrox::test
