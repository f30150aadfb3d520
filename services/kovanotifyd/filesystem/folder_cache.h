#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>

#include "services/kovanotifyd/fan_group.h"

namespace ferrox::notifyd {

/// The places of folders, by their keys: a tree of those that were asked for lately, with all folders above them. Keeps
/// about `folders_max` folders of some 130 bytes, and drops those that were not asked for the longest (LRU).
class FolderCache {
 public:
  /// Marks that a key keeps, whether its folder is in the cache or not.
  enum Mark : uint8_t { kRoot = 1, kQuiet = 2 };

  struct Folder {
    const HandleKey* key = nullptr;
    Folder* parent =
        nullptr;  ///< null for the top of a mount, and for a folder that is removed or outside of all mounts
    std::string name = {};
    uint32_t children = 0;  ///< in the cache; a folder that has some is not dropped
    uint8_t marks = 0;

   private:
    friend class FolderCache;
    Folder* newer_ = nullptr;  ///< neighbours in the order of use
    Folder* older_ = nullptr;
  };

  explicit FolderCache(size_t folders_max) : folders_max_(folders_max) {}
  FolderCache(const FolderCache&) = delete;
  FolderCache& operator=(const FolderCache&) = delete;

  /// The folder, or null when it is not in the cache. Pointers are valid until the next Put of another key, or Clear.
  Folder* Find(const HandleKey& key);
  /// Sets the place of a folder, and adds it if need be. Null, and nothing changes, when `parent` is the folder itself
  /// or below it.
  Folder* Put(const HandleKey& key, Folder* parent, std::string_view name);
  /// Sets the marks of a key; 0 for none.
  void SetMarks(const HandleKey& key, uint8_t marks);
  /// Drops all folders, not the marks.
  void Clear();

  size_t Size() const { return folders_.size(); }

 private:
  void Link(Folder& folder);
  void Unlink(Folder& folder);
  void ForgetOldest(const Folder& keep);

  const size_t folders_max_;
  std::unordered_map<HandleKey, Folder> folders_;
  std::unordered_map<HandleKey, uint8_t> marks_;
  Folder* newest_ = nullptr;
  Folder* oldest_ = nullptr;
};

}  // namespace ferrox::notifyd
