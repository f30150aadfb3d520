#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <string_view>

#include "fileindex/optree/optree.h"

namespace ferrox::fileindex {

/// What a node with children keeps beside them: a hash table of their names, and the chains of those that have
/// something pending. The table holds positions, not names: a slot is eight bytes, and the name is compared only where
/// all 32 bits of the hash agree. Most folders in a queue have one child, for which no table is made.
struct OPBranch {
  /// The child of that name, or null. `hash` is HashName(name).
  OPNode* Find(const OPNode& node, std::string_view name, uint32_t hash);
  /// The last child is new; `hash` is its name's.
  void Added(const OPNode& node, uint32_t hash);

  /// The children at or below which an operation of that class may be pending, chained by OPNode::next_live_.
  std::array<OPNode*, 2> first_live = {};

 private:
  struct Slot {
    uint32_t hash;
    uint32_t child;  ///< its position plus one; 0 in a free slot
  };

  void Grow(size_t count);
  void Put(Slot entry);

  std::unique_ptr<Slot[]> slots_;  ///< at most three quarters taken; none for a single child
  uint32_t capacity_ = 0;          ///< a power of two, or 0 without slots
  uint32_t first_hash_ = 0;        ///< of the first child's name
};

/// A hash with a key of this process: users name the files, and must not be able to choose names that collide.
uint32_t HashName(std::string_view name);

}  // namespace ferrox::fileindex
