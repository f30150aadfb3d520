#pragma once

namespace base {

/// Lowers the calling thread's priority at the processor and the disk, for work that is never urgent. Threads that it
/// starts later inherit that, and an ordinary user cannot take it back. @return false when the system refuses some of
/// it, which changes nothing but the speed of others.
bool YieldToOthers();

/// The same at the processor alone, for work that somebody waits for, but that others go before: beside one other
/// thread on the same processor it still has about a tenth of that.
bool StandBehindOthers();

}  // namespace base
