#pragma once

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <memory>
#include <new>
#include <vector>

#if defined(__SANITIZE_ADDRESS__)
#define FERROX_ARENA_OFF 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define FERROX_ARENA_OFF 1
#endif
#endif

namespace ferrox::fileindex {

/// Memory for the nodes and operations of one tree: cut from large chunks, given back as a whole when the tree and the
/// last object from it are gone. The tree's thread allocates; any thread may release.
class OPArena {
 public:
  OPArena() = default;
  OPArena(const OPArena&) = delete;
  OPArena& operator=(const OPArena&) = delete;

  void* Allocate(size_t bytes, size_t alignment) {
    ++allocated_;
    size_t start = (used_ + alignment - 1) & ~(alignment - 1);
    if (chunks_.empty() || start + bytes > chunk_bytes_) {
      chunk_bytes_ = chunks_.empty() ? kFirstChunkBytes : std::min(2 * chunk_bytes_, kMaxChunkBytes);
      chunks_.emplace_back(new char[chunk_bytes_]);
      start = 0;
    }
    used_ = start + bytes;
    return chunks_.back().get() + start;
  }

  /// One object is gone; with the last, after Close, the arena.
  void Release() {
    if (balance_.fetch_sub(1, std::memory_order_acq_rel) == 1) delete this;
  }

  /// Its tree is gone: nothing is allocated any more. The arena, made with new, may be gone afterwards.
  void Close() {
    const ptrdiff_t allocated = allocated_;
    if (balance_.fetch_add(allocated, std::memory_order_acq_rel) + allocated == 0) delete this;
  }

 private:
  ~OPArena() = default;

  static constexpr size_t kFirstChunkBytes = 4096;
  static constexpr size_t kMaxChunkBytes = 1024 * 1024;

  std::vector<std::unique_ptr<char[]>> chunks_;
  size_t chunk_bytes_ = 0;
  size_t used_ = 0;
  ptrdiff_t allocated_ = 0;
  std::atomic<ptrdiff_t> balance_{0};  // minus the objects released; from Close on, the objects still there
};

/// For std::allocate_shared from an arena. Sanitizers see each object as one of the heap's, so that they notice its
/// end.
template <typename T>
class OPAllocator {
 public:
  using value_type = T;

  explicit OPAllocator(OPArena* arena) : arena_(arena) {}
  template <typename U>
  OPAllocator(const OPAllocator<U>& other) : arena_(other.Arena()) {}

#ifdef FERROX_ARENA_OFF
  T* allocate(size_t count) { return std::allocator<T>().allocate(count); }
  void deallocate(T* object, size_t count) { std::allocator<T>().deallocate(object, count); }
#else
  T* allocate(size_t count) { return static_cast<T*>(arena_->Allocate(count * sizeof(T), alignof(T))); }
  void deallocate(T*, size_t) { arena_->Release(); }
#endif

  OPArena* Arena() const { return arena_; }

 private:
  OPArena* arena_;
};

template <typename T, typename U>
bool operator==(const OPAllocator<T>& a, const OPAllocator<U>& b) {
  return a.Arena() == b.Arena();
}

}  // namespace ferrox::fileindex
