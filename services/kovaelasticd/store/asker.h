#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace ferrox::engine {

/// An ordinary user who searches: what decides which documents of an index exist for them. Root and the owner of the
/// instance are none, and see everything.
struct Asker {
  uint32_t uid = 0;
  std::vector<uint32_t> groups;  ///< all, each once, in ascending order
  std::string share_root;        ///< of the index: folders above it are not asked for their rights
  /// A text of NameRules: what has such a name below the root, or lies below such a folder, does not exist for them.
  std::string unseen_names = {};
};

}  // namespace ferrox::engine
