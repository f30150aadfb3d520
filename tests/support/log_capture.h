#pragma once

#include <string>
#include <vector>

#include "common/log.h"

namespace ferrox::test {

/// Collects what is logged while it lives, in place of the system's log. One at a time.
class LogCapture {
 public:
  LogCapture() {
    Lines().clear();
    before_ = SetLogSink([](int, const char* line) { Lines().emplace_back(line); });
  }
  LogCapture(const LogCapture&) = delete;
  LogCapture& operator=(const LogCapture&) = delete;
  ~LogCapture() { (void)SetLogSink(before_); }

  /// The lines so far. For tests with one thread.
  static std::vector<std::string>& Lines() {
    static std::vector<std::string> lines;
    return lines;
  }
  static bool Contains(const std::string& text) {
    for (const std::string& line : Lines()) {
      if (line.find(text) != std::string::npos) return true;
    }
    return false;
  }

 private:
  LogSink before_;
};

}  // namespace ferrox::test
