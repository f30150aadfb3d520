#pragma once

#include <sqlite3.h>

#include <chrono>
#include <cstddef>
#include <cstdint>

namespace ferrox::engine {

/// Bounds how long the calling thread works for one request, and how much memory the large lists of all such requests
/// have together. Reading connections that it borrows meanwhile stop in the middle of a statement, or at the next page
/// that they read; what takes long without either asks Check. Nothing is bounded without such a scope.
class WorkLimit {
 public:
  explicit WorkLimit(std::chrono::milliseconds longest);
  WorkLimit(const WorkLimit&) = delete;
  WorkLimit& operator=(const WorkLimit&) = delete;
  /// Gives back what the request still holds.
  ~WorkLimit();

  /// @throws Error, as Fail does, when the time is over or memory was refused.
  static void Check();
  /// Whether Check would throw.
  static bool IsOver();
  /// @throws Error kEngineUserBusy; kEngineBusyMemory when other requests have the memory.
  [[noreturn]] static void Fail();
  /// Has the connection's statements stop with SQLITE_INTERRUPT when the calling thread's time is over; lets them run
  /// on when the thread has no limit.
  static void Apply(sqlite3* connection);

  /// Counts bytes that the request is about to hold, until Release or its end: at most MemoryOfAll for all requests
  /// with a limit, half of that for each. When that is not so, the request is over. @return whether it may go on.
  static bool Hold(size_t bytes);
  static void Release(size_t bytes);
  /// Hold, or Fail.
  static void Require(size_t bytes);
  /// Half of the budget for the long lists of searches.
  static size_t MemoryOfAll();
  /// The budget in MiB. 0, as it is first: a quarter of the host's memory, at most 512. On 32 bits never above 1024.
  /// Any thread may call; what requests hold already, they keep.
  static void SetBudget(uint32_t mib);
};

}  // namespace ferrox::engine
