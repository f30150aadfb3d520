#pragma once

#include <sys/stat.h>

#include <functional>
#include <string>

#include "services/fileindexd/share_index.h"
#include "services/fileindexd/tree_walk.h"

namespace ferrox::indexd {

/// What a comparison does with what it finds. Called in the byte order of the paths, by the comparing thread.
struct ComparisonActions {
  /// Whether the document agrees with the file's present state, so that nothing is to be written.
  std::function<bool(const IndexedEntry& indexed, const struct stat& status)> is_current;
  /// The file has no document, or one that is not current.
  std::function<void(const std::string& path, const struct stat& status)> write;
  /// The document's file is gone or no longer indexed.
  std::function<void(const std::string& path)> remove;
  /// Called for each file found, before the other actions for it: to stop, to commit, to count.
  std::function<void()> examine = [] {};
};

/// Compares what lies below `folder` on disk, as `walk` returns it, with the documents that the index has there.
/// Documents of what the system could not read are left alone. Holds one page of documents in memory.
/// @throws what the index and the actions do.
void CompareBelow(const std::string& folder, TreeWalk& walk, ShareIndex& index, const ComparisonActions& actions);

}  // namespace ferrox::indexd
