#pragma once

#include <cstddef>
#include <cstdint>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// A file's bytes in memory, for libraries that want them so; of a file too big for the memory that a worker has, the
/// beginning.
class MappedFile {
 public:
  explicit MappedFile(const Source& source);
  ~MappedFile();
  MappedFile(const MappedFile&) = delete;
  MappedFile& operator=(const MappedFile&) = delete;

  /// Null when it could not be mapped, or is empty.
  const uint8_t* Data() const { return data_; }
  size_t Size() const { return size_; }
  bool IsWhole() const { return whole_; }

 private:
  const uint8_t* data_ = nullptr;
  size_t size_ = 0;
  bool whole_ = true;
};

}  // namespace ferrox::extract
