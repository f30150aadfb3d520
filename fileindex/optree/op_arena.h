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
/// last object from it are gone. A tree of a million operations has two million objects of like age, which a heap would
/// take one by one. The tree's thread allocates; any thread may release, since callers keep objects where they like.
///
/// Objects are counted so that the common case, Release, is one atomic operation and Allocate none: while the tree
/// lives, `balance_` falls below zero by what was released, and Close adds what was allocated. The call that then
/// brings it to zero, Close or a Release, deletes the arena.
class OPArena {
 public:
  OPArena() = default;
  OPArena(const OPArena&) = delete;
  OPArena& operator=(const OPArena&) = delete;

  /// Uninitialized memory of at most kFirstChunkBytes. @throws std::bad_alloc.
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

  // Each chunk is twice the one before, so that a small tree wastes little and a large one has few chunks.
  static constexpr size_t kFirstChunkBytes = 4096;
  static constexpr size_t kMaxChunkBytes = 1024 * 1024;

  std::vector<std::unique_ptr<char[]>> chunks_;  ///< the last is the one that is cut from
  size_t chunk_bytes_ = 0;                       ///< its size,
  size_t used_ = 0;                              ///< and what of it is taken
  ptrdiff_t allocated_ = 0;                      ///< objects so far; of the tree's thread alone
  std::atomic<ptrdiff_t> balance_{0};            ///< minus the objects released; from Close on, the objects still there
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
