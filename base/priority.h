#pragma once

namespace base {

/// Lowers the calling thread's priority at the processor and the disk, for work that is never urgent. Threads that it
/// starts later inherit that, and an ordinary user cannot take it back. @return false when the system refuses some of
/// it, which changes nothing but the speed of others.
bool YieldToOthers();

}  // namespace base
