#pragma once

#include <map>
#include <optional>
#include <string>
#include <vector>

namespace ferrox::indexd {

struct IndexedShare {
  std::string root;  ///< the share's folder
  bool all_paused = true;
};
using IndexedShares = std::map<std::string, IndexedShare>;  ///< by the share's name

/// The shares that exist and that an indexed folder names, as the folders file and the share table say now.
/// @throws Error when either cannot be read.
IndexedShares LoadIndexedShares();

/// The folder of a share; none when the share table has no such share any more, also when it had a moment ago.
/// @throws Error kNoSuchShare when the table cannot be read.
std::optional<std::string> RootOf(const std::string& share);

/// The folders of those shares that lie below `root`.
std::vector<std::string> InnerRoots(const IndexedShares& shares, const std::string& root);

}  // namespace ferrox::indexd
