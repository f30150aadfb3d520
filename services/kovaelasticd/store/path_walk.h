#pragma once

#include <cstdint>
#include <deque>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "services/kovaelasticd/store/folder_tree.h"
#include "services/kovaelasticd/store/sqlite_db.h"
#include "services/kovaelasticd/store/store_rows.h"

namespace ferrox::engine {

/// Goes through the documents whose paths begin with some bytes, in the order of the bytes of whole paths, and may
/// begin behind any path: one way down the tree of folders then, whatever lies before it. In each folder its documents
/// and its folders are read in their order a few at a time, so that the memory does not depend on how many there are;
/// nor does it on the depth, since what was read ahead in a folder is dropped on the way into the next. Documents must
/// not be changed meanwhile. For one thread; every member throws Error kEngineStorage.
class PathWalk {
 public:
  /// `prefix` is absolute, and may end within a name. Only paths behind `after` are visited; "" is before all.
  PathWalk(Database& database, FolderTree& tree, const std::string& prefix, std::string after);

  /// Goes to the next document; false behind the last.
  bool Next();
  /// The document at hand, after a Next that returned true.
  const StoredDocument& Document() const { return document_; }

 private:
  /// Where a folder's list goes on: at that name, or right behind it.
  struct Bound {
    std::string name;
    bool inclusive = true;
  };
  struct Level {
    int64_t folder;
    size_t path_bytes;  ///< of path_
    Bound documents;
    Bound folders;
    std::string end;  ///< names are before this; "": to the last
    bool documents_done = false;
    bool folders_done = false;
  };

  void Enter(int64_t folder, const std::string& begin, std::string end);
  void Leave();
  /// Reads ahead what is used up.
  void Fill(Level& level);
  bool FolderIsNext() const;

  Database& database_;
  const std::string after_;
  std::string path_;  ///< of the folder at hand, with "/"
  std::vector<Level> levels_;
  std::deque<StoredDocument> documents_;  ///< read ahead, of the deepest level
  std::deque<std::pair<std::string, int64_t>> folders_;
  StoredDocument document_;
};

}  // namespace ferrox::engine
