#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// The folders that an index's documents lie in: the table "folders" has a row for each, with the number of the folder
/// above it and its own name. So a folder's path stands in one place, however many documents are below it.
///
/// A path's folder is all of it up to its last "/", the rest is its leaf: "/v/photo/a.jpg" has the leaf "a.jpg" in the
/// folder "/v/photo/". Names end with their "/", since that is what their order among documents depends on: "/v/b-c"
/// comes before "/v/b/x", and so does "b-c" before "b/". A folder is there as long as a document is below it; whether
/// it has a document of its own, which lies in the folder above, is another matter.
///
/// For one thread at a time. What was read is kept, up to kKeptMax folders; whoever reads another snapshot than before,
/// or rolls back, calls Forget. Every member throws Error kEngineStorage.
class FolderTree {
 public:
  static constexpr int64_t kNone = 0;
  static constexpr int64_t kTop = 1;    ///< the folder "/"
  static constexpr int64_t kGone = -1;  ///< what folders that were taken out have above them

  /// `database` must outlive this. `flat`: in a file of a format without the tree, all documents lie in "/", with the
  /// rest of their path as leaf.
  explicit FolderTree(Database& database, bool flat = false) : database_(database), flat_(flat) {}
  bool IsFlat() const { return flat_; }

  /// The part of a path that is its folder, with the "/" at its end. "/" at least, but for the empty path.
  static std::string_view FolderOf(std::string_view path) { return path.substr(0, path.rfind('/') + 1); }
  static std::string_view LeafOf(std::string_view path) { return path.substr(path.rfind('/') + 1); }

  /// The folder with that path, which ends with "/" or is empty, as the top's may be; kNone when there is none.
  int64_t Find(std::string_view folder_path);
  /// The same; makes it, and those missing above it.
  int64_t Make(std::string_view folder_path);
  /// With "/" at its end; "" for a folder that was taken out, or is below such a one.
  std::string PathOf(int64_t folder);
  /// The folder above, and the folder's own name with "/" at its end.
  std::pair<int64_t, std::string> PlaceOf(int64_t folder);
  /// The folder and all below it, each before those in it.
  std::vector<int64_t> AtAndBelow(int64_t folder);
  /// The same; nothing when there are more than `most`.
  std::optional<std::vector<int64_t>> AtAndBelow(int64_t folder, size_t most);
  /// The folders in `folder` whose names begin with `begin`; all for "".
  std::vector<int64_t> ChildrenOf(int64_t folder, const std::string& begin);
  /// Whether a folder is `other`, or lies below it.
  bool IsAtOrBelow(int64_t folder, int64_t other);
  /// Gives a folder, with all below it, the path `new_path`, which no folder has and which does not lie below it.
  /// Prunes where it was.
  void Move(int64_t folder, std::string_view new_path);
  /// The number of a folder's access record; 0: none. It is that of the folder's own document where there is one, which
  /// whoever changes that document sees to; a folder that is made or moved takes it over by itself.
  int64_t AccessOf(int64_t folder) { return NodeOf(folder).access; }
  void SetAccess(int64_t folder, int64_t access);
  /// Takes a folder with all below it out of the tree: it has no path any more, and what it is named is free. Among
  /// those that were taken out its name is `gone_name`, which none may have.
  void TakeOut(int64_t folder, std::string_view gone_name);
  /// The folders that were taken out and have a name behind `gone_name`, in the order of their names.
  static std::vector<int64_t> GoneAfter(Database& database, const std::string& gone_name);
  /// The last name among these; "" when there are none.
  static std::string NewestGone(Database& database);
  /// Removes the folder if nothing is in it, and then those above it for which that holds.
  void Prune(int64_t folder);
  /// Drops what was kept.
  void Forget();

 private:
  static constexpr size_t kKeptMax = 4096;
  struct Node {
    int64_t parent;
    std::string name;
    int64_t access;
  };

  Node NodeOf(int64_t folder);
  std::optional<int64_t> AccessOfDocument(int64_t parent, std::string_view name);
  int64_t ChildOf(int64_t parent, std::string_view name);
  int64_t AddChild(int64_t parent, std::string_view name);
  /// Follows the names of `folder_path` from the top. `next` gives the child of a folder, kNone to end.
  template <typename Next>
  int64_t Descend(std::string_view folder_path, Next next);
  void Keep(int64_t folder, Node node);
  void Drop(int64_t folder);
  bool IsEmpty(int64_t folder);

  Database& database_;
  const bool flat_;
  std::unordered_map<int64_t, Node> nodes_;
  std::map<std::pair<int64_t, std::string>, int64_t> children_;  ///< by parent and name, those of nodes_
};

}  // namespace ferrox::engine
