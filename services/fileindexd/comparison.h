#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <functional>
#include <string>

#include "services/fileindexd/share_index.h"
#include "services/fileindexd/tree_walk.h"

namespace ferrox::indexd {

/// What a comparison does with what it finds. Called folder by folder, in the byte order of the names in each, by the
/// comparing thread.
struct ComparisonActions {
  /// Whether the document agrees with the file's present state, so that nothing is to be written.
  std::function<bool(const IndexedEntry& indexed, const struct stat& status)> is_current;
  /// Whether the content of the file is to be in its document.
  std::function<bool(const std::string& path, const struct stat& status)> wants_content;
  /// Whether content that was not read, or not all of it, is to be read again.
  std::function<bool(const UnreadContent& unread)> is_worth_another_try;
  /// The file has no document, or one that is not current.
  std::function<void(const std::string& path, const struct stat& status)> write;
  /// The document's file is gone or no longer indexed.
  std::function<void(const std::string& path)> remove;
  /// So many documents are current; is_current was not asked for any of them.
  std::function<void(uint64_t documents)> are_current = [](uint64_t) {};
  /// Called again and again, before the other actions for a file: to stop, to commit, to count.
  std::function<void()> examine = [] {};
};

/// Compares what lies below `folder` on disk, as `walk` returns it, with the documents that the index has there.
/// Documents of what the system could not read are left alone. All files are looked at (lstat), but documents are seen
/// only of folders in which any is not current: the index has a digest of those directly in each folder, in which is
/// all that makes them current. Holds one page of documents and one of folders in memory.
/// @throws what the index and the actions do.
void CompareBelow(const std::string& folder, TreeWalk& walk, ShareIndex& index, const ComparisonActions& actions);

}  // namespace ferrox::indexd
