#pragma once

#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "services/kovanotifyd/filesystem/folder_cache.h"

namespace ferrox::notifyd {

/// The roots by the keys of their folders, and the full paths that names below them have. The folders of roots are
/// marked in the cache, so that a path is put together on one way up from its folder.
class WatchedRoots {
 public:
  explicit WatchedRoots(FolderCache& cache) : cache_(cache) {}

  /// `folder` is that of the root, located with all folders above it.
  void Add(const std::string& root, const FolderCache::Folder& folder);
  void Remove(const std::string& root);
  /// Leaves out what lies in these folders, which are the daemons' own, below a root.
  void SetQuiet(const std::vector<HandleKey>& folders);

  bool Has(const std::string& root) const { return roots_.count(root) != 0; }
  /// All roots, or those on the file system of a key.
  std::vector<std::string> Paths() const;
  std::vector<std::string> PathsOn(const HandleKey& file_system) const;
  /// The roots at and below a folder, by the folders that were above them when they were added.
  std::vector<std::string> At(const HandleKey& folder) const;
  const HandleKey& KeyOf(const std::string& root) const { return roots_.at(root).key; }

  /// Puts the full paths of `name` in `folder` into `paths`: none outside of all roots, several when one folder is
  /// mounted at several places that are roots. The name "." is the folder itself.
  /// @return whether it lies in a quiet folder.
  bool FullPaths(const FolderCache::Folder& folder, std::string_view name, std::vector<std::string>& paths);

 private:
  struct Root {
    HandleKey key;
    std::vector<HandleKey> above;  ///< the folders above it, on its file system
  };

  void ChangeMark(const HandleKey& key, FolderCache::Mark mark, bool is_set);
  std::string Compose(const std::string& root, std::string_view name) const;

  FolderCache& cache_;
  std::map<std::string, Root> roots_;
  std::unordered_map<HandleKey, std::vector<std::string>> by_key_;  ///< paths of roots with the same folder
  std::vector<HandleKey> quiet_;
  std::vector<const FolderCache::Folder*> way_;  ///< FullPaths: the folders on the way up; kept for its memory
};

}  // namespace ferrox::notifyd
