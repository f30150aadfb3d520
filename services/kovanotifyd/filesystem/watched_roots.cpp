#include "services/kovanotifyd/filesystem/watched_roots.h"

#include <algorithm>
#include <utility>

namespace ferrox::notifyd {

void WatchedRoots::ChangeMark(const HandleKey& key, FolderCache::Mark mark, bool is_set) {
  uint8_t marks = by_key_.count(key) != 0 ? FolderCache::kRoot : 0;
  if (std::find(quiet_.begin(), quiet_.end(), key) != quiet_.end()) marks |= FolderCache::kQuiet;
  cache_.SetMarks(key, static_cast<uint8_t>(is_set ? marks | mark : marks & ~mark));
}

void WatchedRoots::Add(const std::string& root, const FolderCache::Folder& folder) {
  Remove(root);
  Root& added = roots_[root];
  added.key = *folder.key;
  for (const FolderCache::Folder* above = folder.parent; above != nullptr; above = above->parent) {
    added.above.push_back(*above->key);
  }
  by_key_[added.key].push_back(root);
  ChangeMark(added.key, FolderCache::kRoot, true);
}

void WatchedRoots::Remove(const std::string& root) {
  const auto found = roots_.find(root);
  if (found == roots_.end()) return;
  const HandleKey key = found->second.key;
  std::vector<std::string>& paths = by_key_[key];
  paths.erase(std::remove(paths.begin(), paths.end(), root), paths.end());
  if (paths.empty()) {
    by_key_.erase(key);
    ChangeMark(key, FolderCache::kRoot, false);
  }
  roots_.erase(found);
}

void WatchedRoots::SetQuiet(const std::vector<HandleKey>& folders) {
  const std::vector<HandleKey> before = std::exchange(quiet_, folders);
  for (const HandleKey& key : before) ChangeMark(key, FolderCache::kQuiet, false);
  for (const HandleKey& key : quiet_) ChangeMark(key, FolderCache::kQuiet, true);
}

std::vector<std::string> WatchedRoots::Paths() const {
  std::vector<std::string> paths;
  for (const auto& [path, root] : roots_) paths.push_back(path);
  return paths;
}

std::vector<std::string> WatchedRoots::PathsOn(const HandleKey& file_system) const {
  std::vector<std::string> paths;
  for (const auto& [path, root] : roots_) {
    if (FanGroup::IsSameFileSystem(root.key, file_system)) paths.push_back(path);
  }
  return paths;
}

std::vector<std::string> WatchedRoots::At(const HandleKey& folder) const {
  std::vector<std::string> paths;
  for (const auto& [path, root] : roots_) {
    const bool is_above = std::find(root.above.begin(), root.above.end(), folder) != root.above.end();
    if (is_above || root.key == folder) paths.push_back(path);
  }
  return paths;
}

bool WatchedRoots::FullPaths(const FolderCache::Folder& folder, std::string_view name,
                             std::vector<std::string>& paths) {
  paths.clear();
  way_.clear();
  for (const FolderCache::Folder* at = &folder; at != nullptr; at = at->parent) {
    if ((at->marks & FolderCache::kRoot) != 0) {
      for (const std::string& root : by_key_.find(*at->key)->second) {
        std::string path = Compose(root, name);
        // A root within another one leads to the same path.
        if (std::find(paths.begin(), paths.end(), path) == paths.end()) paths.push_back(std::move(path));
      }
    }
    if ((at->marks & FolderCache::kQuiet) != 0) return true;
    way_.push_back(at);
  }
  return false;
}

std::string WatchedRoots::Compose(const std::string& root, std::string_view name) const {
  size_t size = root.size() + name.size() + 1;
  for (const FolderCache::Folder* folder : way_) size += folder->name.size() + 1;
  std::string path;
  path.reserve(size);
  if (root != "/") path = root;
  for (auto folder = way_.rbegin(); folder != way_.rend(); ++folder) path.append(1, '/').append((*folder)->name);
  if (name != ".") path.append(1, '/').append(name);
  return path.empty() ? "/" : path;
}

}  // namespace ferrox::notifyd
