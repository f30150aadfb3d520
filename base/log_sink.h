#pragma once

#include <atomic>
#include <string_view>

namespace base {

/// Where the lines of a log go: to the system's (syslog) unless a program, or a test, takes them itself. Safe for
/// threads; a line that another thread is writing meanwhile may still go to the function before.
class LogSink {
 public:
  /// Takes one line; `priority` is one of syslog's.
  using Function = void (*)(int priority, const char* line);

  constexpr LogSink() = default;
  LogSink(const LogSink&) = delete;
  LogSink& operator=(const LogSink&) = delete;

  /// Writes one line, its control characters as \xNN, so that no file name can forge a line. Keeps errno.
  void Write(int priority, std::string_view line) const;

  /// Makes `function` the receiver, null the system's log. @return the receiver before, never null.
  Function Set(Function function);

 private:
  static void WriteToSystem(int priority, const char* line);
  std::atomic<Function> function_{&WriteToSystem};
};

}  // namespace base
