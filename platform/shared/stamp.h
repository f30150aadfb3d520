#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <string>

namespace kova {

/// The "_KOVAStamp" of kova/content_extract.h. Times are in nanoseconds since the epoch.
/// A text that differs when size, content, attributes or the file itself do.
std::string StampText(uint64_t size, int64_t mtime_ns, int64_t ctime_ns, uint64_t inode);

inline int64_t Nanoseconds(int64_t seconds, int64_t nanoseconds) { return seconds * INT64_C(1000000000) + nanoseconds; }

}  // namespace kova
