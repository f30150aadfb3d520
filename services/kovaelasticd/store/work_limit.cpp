#include "services/kovaelasticd/store/work_limit.h"

#include <optional>

#include "common/error.h"

namespace ferrox::engine {

namespace {

using WorkClock = std::chrono::steady_clock;

/// Steps of SQLite's machine between two looks at the clock: well below a millisecond.
constexpr int kStepsBetweenLooks = 10000;

thread_local std::optional<WorkClock::time_point> t_work_end;

bool IsWorkOver() { return t_work_end.has_value() && WorkClock::now() >= *t_work_end; }

int StopWhenOver(void*) { return IsWorkOver() ? 1 : 0; }

}  // namespace

WorkLimit::WorkLimit(std::chrono::milliseconds longest) { t_work_end = WorkClock::now() + longest; }

WorkLimit::~WorkLimit() { t_work_end.reset(); }

void WorkLimit::Check() {
  if (IsWorkOver()) Fail();
}

void WorkLimit::Fail() { throw Error(Error::kEngineUserBusy, "this search takes too long; narrow it"); }

void WorkLimit::Apply(sqlite3* connection) {
  const bool is_limited = t_work_end.has_value();
  sqlite3_progress_handler(connection, is_limited ? kStepsBetweenLooks : 0, is_limited ? &StopWhenOver : nullptr,
                           nullptr);
}

}  // namespace ferrox::engine
