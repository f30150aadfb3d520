#include "platform/shared/stamp.h"

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

namespace {

/// The part of a stamp from its `dots`-th "." on, or up to it.
std::string From(const std::string& stamp, int dots) {
  size_t at = std::string::npos;
  for (int i = 0; i < dots; ++i) at = stamp.find('.', at + 1);
  return at == std::string::npos ? stamp : stamp.substr(at);
}
std::string UpTo(const std::string& stamp, int dots) {
  return stamp.substr(0, stamp.size() - From(stamp, dots).size());
}

}  // namespace

std::string Stamp(const struct stat& status) {
  using kova::Nanoseconds;
  return kova::StampText(static_cast<uint64_t>(status.st_size),
                         Nanoseconds(status.st_mtim.tv_sec, status.st_mtim.tv_nsec),
                         Nanoseconds(status.st_ctim.tv_sec, status.st_ctim.tv_nsec), status.st_ino);
}

bool SameFile(const std::string& stamp, const std::string& other) { return From(stamp, 3) == From(other, 3); }

bool SameContent(const std::string& stamp, const std::string& other) {
  return SameFile(stamp, other) && UpTo(stamp, 2) == UpTo(other, 2);
}

}  // namespace KOVA::CONTENT_EXTRACT
