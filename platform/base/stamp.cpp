#include "platform/base/stamp.h"

#include <cinttypes>
#include <cstdio>

#include <kova/content_extract.h>

namespace kova {

std::string StampText(uint64_t size, int64_t mtime_ns, int64_t ctime_ns, uint64_t inode) {
  char text[96];
  (void)snprintf(text, sizeof(text), "%" PRIu64 ".%" PRId64 ".%" PRId64 ".%" PRIu64, size, mtime_ns, ctime_ns, inode);
  return text;
}

}  // namespace kova

namespace KOVA::CONTENT_EXTRACT {

std::string Stamp(const struct stat& status) {
  using kova::Nanoseconds;
  return kova::StampText(static_cast<uint64_t>(status.st_size),
                         Nanoseconds(status.st_mtim.tv_sec, status.st_mtim.tv_nsec),
                         Nanoseconds(status.st_ctim.tv_sec, status.st_ctim.tv_nsec), status.st_ino);
}

}  // namespace KOVA::CONTENT_EXTRACT
