#include "services/kovaelasticd/store/work_limit.h"

#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cstdint>

#include "common/error.h"
#include "services/kovaelasticd/store/checksum_vfs.h"

namespace ferrox::engine {

namespace {

using WorkClock = std::chrono::steady_clock;

/// Steps of SQLite's machine between two looks at the clock: well below a millisecond.
constexpr int kStepsBetweenLooks = 10000;
constexpr uint64_t kUsualMostMib = 512;
constexpr uint64_t kBudgetMostMib = sizeof(size_t) > 4 ? uint64_t{UINT32_MAX} : 1024;

/// Of the calling thread's request.
struct Work {
  bool limited = false;
  WorkClock::time_point end;
  size_t held = 0;
  int refused = 0;  ///< the code of the failure once memory was refused
};
thread_local Work t_work;

std::atomic<size_t> g_held{0};          ///< by all
std::atomic<uint32_t> g_budget_mib{0};  ///< 0: the usual one

uint64_t UsualBudgetMib() {
  static const auto usual = [] {
    const long pages = sysconf(_SC_PHYS_PAGES), page_size = sysconf(_SC_PAGE_SIZE);
    if (pages <= 0 || page_size <= 0) return kUsualMostMib;
    const uint64_t host_mib = static_cast<uint64_t>(pages) * static_cast<uint64_t>(page_size) >> 20;
    return std::min(kUsualMostMib, host_mib / 4);
  }();
  return usual;
}

int StopWhenOver(void*) { return WorkLimit::IsOver() ? 1 : 0; }

}  // namespace

WorkLimit::WorkLimit(std::chrono::milliseconds longest) {
  t_work = {};
  t_work.limited = true;
  t_work.end = WorkClock::now() + longest;
}

WorkLimit::~WorkLimit() {
  g_held -= t_work.held;
  t_work = {};
}

bool WorkLimit::IsOver() { return t_work.limited && (t_work.refused != 0 || WorkClock::now() >= t_work.end); }

void WorkLimit::Check() {
  if (IsOver()) Fail();
}

void WorkLimit::Fail() {
  if (t_work.refused == Error::kEngineBusyMemory) {
    throw Error(Error::kEngineBusyMemory, "the engine is short of memory; ask again later");
  }
  throw Error(Error::kEngineUserBusy, t_work.refused != 0 ? "this search takes too much memory; narrow it"
                                                          : "this search takes too long; narrow it");
}

void WorkLimit::Apply(sqlite3* connection) {
  const bool is_limited = t_work.limited;
  sqlite3_progress_handler(connection, is_limited ? kStepsBetweenLooks : 0, is_limited ? &StopWhenOver : nullptr,
                           nullptr);
  ObeyWorkLimit(connection, is_limited);
}

/// What a request has of its own is looked at first: that it has too much follows from the request alone.
bool WorkLimit::Hold(size_t bytes) {
  if (!t_work.limited) return true;
  if (t_work.refused != 0) return false;
  if (bytes > MemoryOfAll() / 2 - std::min(MemoryOfAll() / 2, t_work.held)) {
    t_work.refused = Error::kEngineUserBusy;
  } else if (g_held.fetch_add(bytes) + bytes > MemoryOfAll()) {
    g_held -= bytes;
    t_work.refused = Error::kEngineBusyMemory;
  } else {
    t_work.held += bytes;
  }
  return t_work.refused == 0;
}

void WorkLimit::Release(size_t bytes) {
  const size_t released = std::min(bytes, t_work.held);
  t_work.held -= released;
  g_held -= released;
}

void WorkLimit::Require(size_t bytes) {
  if (!Hold(bytes)) Fail();
}

size_t WorkLimit::MemoryOfAll() {
  const uint64_t mib = g_budget_mib != 0 ? g_budget_mib.load() : UsualBudgetMib();
  return static_cast<size_t>(std::min(mib, kBudgetMostMib) << 20) / 2;
}

void WorkLimit::SetBudget(uint32_t mib) { g_budget_mib = mib; }

}  // namespace ferrox::engine
