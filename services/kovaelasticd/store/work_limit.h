#pragma once

#include <sqlite3.h>

#include <chrono>

namespace ferrox::engine {

/// Bounds how long the calling thread works for one request. Reading connections that it borrows meanwhile stop in the
/// middle of a statement; what takes long without one asks Check. Nothing is bounded without such a scope.
class WorkLimit {
 public:
  explicit WorkLimit(std::chrono::milliseconds longest);
  WorkLimit(const WorkLimit&) = delete;
  WorkLimit& operator=(const WorkLimit&) = delete;
  ~WorkLimit();

  /// @throws Error kEngineUserBusy when the time is over.
  static void Check();
  [[noreturn]] static void Fail();
  /// Has the connection's statements stop with SQLITE_INTERRUPT when the calling thread's time is over; lets them run
  /// on when the thread has no limit.
  static void Apply(sqlite3* connection);
};

}  // namespace ferrox::engine
