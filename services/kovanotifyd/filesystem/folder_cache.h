#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>

#include "services/kovanotifyd/fan_group.h"

namespace ferrox::notifyd {

/// Where folders are, by their keys: a tree of those that were lately asked for, with all that is above them. Keeps
/// about `folders_max` of them, some 130 bytes each, and forgets those that were longest not asked for.
class FolderCache {
 public:
  /// Marks that a key keeps, whether its folder is known or not.
  enum Mark : uint8_t { kRoot = 1, kQuiet = 2 };

  struct Folder {
    const HandleKey* key = nullptr;
    Folder* parent = nullptr;  ///< null of what has nothing above it: the top of a mount, or a folder that is nowhere
    std::string name = {};
    uint32_t children = 0;
    uint8_t marks = 0;

   private:
    friend class FolderCache;
    Folder* newer_ = nullptr;
    Folder* older_ = nullptr;
  };

  explicit FolderCache(size_t folders_max) : folders_max_(folders_max) {}
  FolderCache(const FolderCache&) = delete;
  FolderCache& operator=(const FolderCache&) = delete;

  /// The folder, or null when it is not known. Pointers hold until the next Put of another key, or Clear.
  Folder* Find(const HandleKey& key);
  /// Places a folder, new or known. Null, and nothing is changed, when `parent` is the folder itself or below it.
  Folder* Put(const HandleKey& key, Folder* parent, std::string_view name);
  /// Marks the key's folder; 0 for none.
  void SetMarks(const HandleKey& key, uint8_t marks);
  /// Forgets all folders, not the marks.
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
