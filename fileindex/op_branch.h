#pragma once

#include <array>
#include <cstdint>
#include <string_view>
#include <vector>

#include "fileindex/optree.h"

namespace ferrox::fileindex {

/// What a node with children keeps beside them.
struct OPBranch {
  /// The child of that name, or null. Searches a few children one by one, more of them by an index.
  OPNode* Find(const OPNode& node, std::string_view name);
  /// The last child is new.
  void Added(const OPNode& node);

  /// The children at or below which an operation of that class may be pending, in no order.
  std::array<std::vector<OPNode*>, 2> live;

 private:
  struct Slot {
    uint32_t hash;
    uint32_t child;  // its position plus one; 0 in a free slot
  };

  void Rebuild(const OPNode& node);
  void Put(Slot entry);

  std::vector<Slot> slots_;  // a power of two of them, at most three quarters taken; none while the children are few
  size_t indexed_ = 0;       // how many children are in the slots
};

}  // namespace ferrox::fileindex
