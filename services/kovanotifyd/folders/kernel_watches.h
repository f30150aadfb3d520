#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "services/kovanotifyd/folders/folder_port.h"
#include "services/kovanotifyd/folders/folder_tree.h"

namespace ferrox::notifyd {

/// The kernel's watches of the folders in a tree: a folder of the tree is watched while it has a key. Ending a watch is
/// put off, since a key that one folder of the tree gives up is often taken over by another one at once.
class KernelWatches {
 public:
  using Id = FolderTree::Id;

  /// `max`: how many folders may be watched; 0: 80 % of the port's limit, which other programs of the user share.
  KernelWatches(FolderPort& port, FolderTree& tree, uint64_t max);

  bool IsFull() const { return tree_.Keys() >= max_; }
  /// Watches an open folder. Leaves the tree as it is.
  /// @return errno, or 0 and the folder's key.
  int Watch(int folder, FolderPort::Wanted wanted, FolderKey& key) { return port_.Watch(folder, wanted, key); }
  /// Why Watch failed, or, of ENOSPC, why no more folders may be watched; a sentence without a full stop.
  std::string Reason(int error) const;
  /// Never ends the watch with that key: it serves something beside the tree.
  void Keep(FolderKey key) { kept_ = key; }

  /// Takes the key from a folder of the tree. Its watch ends later, unless another folder has the key by then.
  void Drop(Id id);
  /// Removes a folder with all below it from the tree, and drops their keys.
  void RemoveFromTree(Id id);
  bool HasDropped() const { return !dropped_.empty(); }
  /// Ends some of the watches that were dropped.
  void EndDropped();

  /// Whether the kernel has no records that are not read yet.
  bool IsAllRead() const;

 private:
  FolderPort& port_;
  FolderTree& tree_;
  uint64_t max_;
  FolderKey kept_ = 0;
  std::vector<std::pair<FolderKey, std::string>> dropped_;  ///< each with the folder's path, where the port needs it
};

}  // namespace ferrox::notifyd
