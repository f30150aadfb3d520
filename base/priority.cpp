#include "base/priority.h"

#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace base {

/// The calls of both take 0 for the calling thread.
bool YieldToOthers() {
  constexpr int kNiceness = 10, kWhoProcess = 1, kIdleClass = 3, kClassShift = 13;
  const bool disk = syscall(SYS_ioprio_set, kWhoProcess, 0, kIdleClass << kClassShift) == 0;
  return setpriority(PRIO_PROCESS, 0, kNiceness) == 0 && disk;
}

bool StandBehindOthers() {
  constexpr int kNiceness = 10;
  return setpriority(PRIO_PROCESS, 0, kNiceness) == 0;
}

}  // namespace base
