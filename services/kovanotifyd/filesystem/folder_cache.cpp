#include "services/kovanotifyd/filesystem/folder_cache.h"

namespace ferrox::notifyd {

FolderCache::Folder* FolderCache::Find(const HandleKey& key) {
  const auto found = folders_.find(key);
  if (found == folders_.end()) return nullptr;
  Folder& folder = found->second;
  if (newest_ != &folder) {
    Unlink(folder);
    Link(folder);
  }
  return &folder;
}

FolderCache::Folder* FolderCache::Put(const HandleKey& key, Folder* parent, std::string_view name) {
  const auto found = folders_.find(key);
  if (found != folders_.end()) {
    for (const Folder* above = parent; above != nullptr; above = above->parent) {
      if (above == &found->second) return nullptr;
    }
  }
  const auto [place, is_new] = folders_.try_emplace(key);
  Folder& folder = place->second;
  if (is_new) {
    const auto marks = marks_.find(key);
    folder.key = &place->first;
    folder.marks = marks == marks_.end() ? 0 : marks->second;
    Link(folder);
  }
  if (parent != nullptr) ++parent->children;
  if (folder.parent != nullptr) --folder.parent->children;
  folder.parent = parent;
  folder.name = name;
  if (is_new && folders_.size() > folders_max_) ForgetOldest(folder);
  return &folder;
}

void FolderCache::SetMarks(const HandleKey& key, uint8_t marks) {
  if (marks == 0) {
    marks_.erase(key);
  } else {
    marks_[key] = marks;
  }
  const auto found = folders_.find(key);
  if (found != folders_.end()) found->second.marks = marks;
}

void FolderCache::Clear() {
  folders_.clear();
  newest_ = oldest_ = nullptr;
}

void FolderCache::Link(Folder& folder) {
  folder.older_ = newest_;
  folder.newer_ = nullptr;
  (newest_ != nullptr ? newest_->newer_ : oldest_) = &folder;
  newest_ = &folder;
}

void FolderCache::Unlink(Folder& folder) {
  (folder.newer_ != nullptr ? folder.newer_->older_ : newest_) = folder.older_;
  (folder.older_ != nullptr ? folder.older_->newer_ : oldest_) = folder.newer_;
}

/// Drops the oldest folder without children. Those with children that come before it in the order count as used now.
/// Gives up after some attempts: then the cache is a little larger for a while.
void FolderCache::ForgetOldest(const Folder& keep) {
  constexpr int kAttempts = 64;
  for (int attempt = 0; attempt < kAttempts; ++attempt) {
    Folder& oldest = *oldest_;
    Unlink(oldest);
    if (oldest.children == 0 && &oldest != &keep) {
      if (oldest.parent != nullptr) --oldest.parent->children;
      folders_.erase(folders_.find(*oldest.key));
      return;
    }
    Link(oldest);
  }
}

}  // namespace ferrox::notifyd
