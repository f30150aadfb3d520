#include "services/kovacontentextractd/readers/mapped_file.h"

#include <sys/mman.h>

#include <algorithm>

namespace ferrox::extract {

namespace {

/// Half of the address space that a worker has (sandbox.cpp), or less.
constexpr size_t kMappedMaxBytes = sizeof(void*) == 8 ? 128U << 20 : 48U << 20;

}  // namespace

MappedFile::MappedFile(const Source& source) {
  size_ = static_cast<size_t>(std::min<uint64_t>(source.size, kMappedMaxBytes));
  whole_ = size_ == source.size;
  void* mapped = size_ > 0 ? mmap(nullptr, size_, PROT_READ, MAP_PRIVATE, source.fd, 0) : MAP_FAILED;
  if (mapped != MAP_FAILED) data_ = static_cast<const uint8_t*>(mapped);
}

MappedFile::~MappedFile() {
  if (data_ != nullptr) (void)munmap(const_cast<uint8_t*>(data_), size_);
}

}  // namespace ferrox::extract
