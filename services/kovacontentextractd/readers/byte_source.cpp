#include "services/kovacontentextractd/readers/byte_source.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>

namespace ferrox::extract {

std::string ReadAll(ByteSource& source, size_t limit_bytes) {
  constexpr size_t kPieceBytes = 64U << 10;
  std::string all;
  while (all.size() < limit_bytes) {
    const size_t before = all.size();
    all.resize(std::min(limit_bytes, before + kPieceBytes));
    const size_t got = source.Read(all.data() + before, all.size() - before);
    all.resize(before + got);
    if (got == 0) break;
  }
  return all;
}

size_t FileBytes::ReadAt(uint64_t offset, char* buffer, size_t room) const {
  size_t have = 0;
  while (have < room && offset + have < size_) {
    const ssize_t got = pread(fd_, buffer + have, room - have, static_cast<off_t>(offset + have));
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) break;
    have += static_cast<size_t>(got);
  }
  return have;
}

std::string FileBytes::ReadAt(uint64_t offset, size_t room) const {
  if (offset >= size_) return {};
  std::string bytes(static_cast<size_t>(std::min<uint64_t>(room, size_ - offset)), '\0');
  bytes.resize(ReadAt(offset, bytes.data(), bytes.size()));
  return bytes;
}

size_t FileSource::Read(char* buffer, size_t room) {
  const size_t got = bytes_.ReadAt(at_, buffer, room);
  at_ += got;
  return got;
}

}  // namespace ferrox::extract
