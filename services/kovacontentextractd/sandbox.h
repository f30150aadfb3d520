#pragma once

#include <string>
#include <vector>

namespace ferrox::extract {

/// A sanitizer takes terabytes of addresses and a system call of its own; its processes have no limit of memory.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
inline constexpr bool kSanitized = true;
#elif defined(__has_feature)
inline constexpr bool kSanitized = __has_feature(address_sanitizer) || __has_feature(thread_sanitizer);
#else
inline constexpr bool kSanitized = false;
#endif

/// Takes from this process, for good, what root may and others may not: a template needs nothing of it once it is
/// loaded, and its workers never have it. A process that may change its user takes one that no other process has.
/// @param empty_folder becomes the root of the file system where that is allowed
/// @return what is missing, one name each; empty when all is given up
std::vector<std::string> GiveUpRights(const char* empty_folder);

/// Takes from this process, for good, all but computing and reading what is open: files by name, sockets, processes,
/// executable memory. What the kernel does not have is left out.
/// @return what is missing, one name each; empty when the sandbox is complete
std::vector<std::string> CloseSandbox();

/// The CPU time that one file may take.
inline constexpr int kCpuSecondsPerFile = 20;
/// Starts to count it anew. The process is killed by SIGPROF when it is used up.
void LimitCpuTime(int limit_seconds);

}  // namespace ferrox::extract
