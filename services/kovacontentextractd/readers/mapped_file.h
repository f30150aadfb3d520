#pragma once

#include <cstddef>
#include <cstdint>

#include "services/kovacontentextractd/readers/reader.h"

namespace ferrox::extract {

/// A file's bytes in memory, for libraries that want them so; of a file too big for the memory that a worker has, the
/// first 128 MiB (48 MiB on 32 bits). A file that somebody shortens meanwhile kills the worker by SIGBUS when its end
/// is read, which the daemon counts as a crash like any other.
class MappedFile {
 public:
  explicit MappedFile(const Source& source);
  ~MappedFile();
  MappedFile(const MappedFile&) = delete;
  MappedFile& operator=(const MappedFile&) = delete;

  /// Null when it could not be mapped, or is empty.
  const uint8_t* Data() const { return data_; }
  /// Of what is mapped.
  size_t Size() const { return size_; }
  /// Whether that is all of the file.
  bool IsWhole() const { return whole_; }

 private:
  const uint8_t* data_ = nullptr;
  size_t size_ = 0;
  bool whole_ = true;
};

}  // namespace ferrox::extract
