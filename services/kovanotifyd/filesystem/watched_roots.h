#pragma once

#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "services/kovanotifyd/filesystem/folder_cache.h"

namespace ferrox::notifyd {

/// The roots by the keys of their folders, and the full paths that names have through them.
class WatchedRoots {
 public:
  explicit WatchedRoots(FolderCache& cache) : cache_(cache) {}

  /// `folder` is the root's, with all above it.
  void Add(const std::string& root, const FolderCache::Folder& folder);
  void Remove(const std::string& root);
  /// Nothing in these folders of the daemons is a change of a root above them.
  void SetQuiet(const std::vector<HandleKey>& folders);

  bool Has(const std::string& root) const { return roots_.count(root) != 0; }
  /// All, or those on one file system.
  std::vector<std::string> Paths() const;
  std::vector<std::string> PathsOn(const HandleKey& file_system) const;
  /// Those that the folder is, or that are below it.
  std::vector<std::string> At(const HandleKey& folder) const;
  const HandleKey& KeyOf(const std::string& root) const { return roots_.at(root).key; }

  /// Puts the full paths of `name` in `folder` into `paths`: none outside of all roots, several when its folder is
  /// mounted at several places that are roots. The name "." is the folder itself.
  /// @return whether it lies in a quiet folder.
  bool FullPaths(const FolderCache::Folder& folder, std::string_view name, std::vector<std::string>& paths);

 private:
  struct Root {
    HandleKey key;
    std::vector<HandleKey> above;
  };

  void ChangeMark(const HandleKey& key, FolderCache::Mark mark, bool is_set);
  std::string Compose(const std::string& root, std::string_view name) const;

  FolderCache& cache_;
  std::map<std::string, Root> roots_;
  std::unordered_map<HandleKey, std::vector<std::string>> by_key_;
  std::vector<HandleKey> quiet_;
  std::vector<const FolderCache::Folder*> way_;  ///< from the folder up, while a path is composed
};

}  // namespace ferrox::notifyd
