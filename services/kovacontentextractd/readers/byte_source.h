#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// Bytes that come one piece after the other: a file, a member of a container as it is unpacked, a stream within a
/// file.
class ByteSource {
 public:
  virtual ~ByteSource() = default;
  /// Reads up to `room` bytes; 0 at the end, and where it cannot be read on.
  virtual size_t Read(char* buffer, size_t room) = 0;
};

/// At most `limit_bytes` of what is left in `source`.
std::string ReadAll(ByteSource& source, size_t limit_bytes);

/// Bytes of a file at any place, without moving the descriptor's position.
class FileBytes {
 public:
  explicit FileBytes(const Source& source) : fd_(source.fd), size_(source.size) {}
  uint64_t Size() const { return size_; }
  /// Reads as many of the `room` bytes at `offset` as the file has; fewer only at its end, or where it cannot be read.
  size_t ReadAt(uint64_t offset, char* buffer, size_t room) const;
  /// The same as a string; "" behind the end.
  std::string ReadAt(uint64_t offset, size_t room) const;

 private:
  int fd_;         ///< the caller's
  uint64_t size_;  ///< when the reading began
};

/// A file from its beginning.
class FileSource : public ByteSource {
 public:
  explicit FileSource(const Source& source) : bytes_(source) {}
  /// Reads on; does not move the descriptor's position.
  size_t Read(char* buffer, size_t room) override;
  /// Passes `count` bytes without reading them.
  void Skip(uint64_t count) { at_ += std::min(count, bytes_.Size() - std::min(at_, bytes_.Size())); }

 private:
  FileBytes bytes_;
  uint64_t at_ = 0;
};

}  // namespace ferrox::extract
