#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovanotifyd/folders/folder_tree.h"
#include "services/kovanotifyd/folders/inspection_queue.h"
#include "services/kovanotifyd/folders/kernel_watches.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Which names in one folder are to be watched: those that at least one root above it does not ignore.
class NameFilter {
 public:
  /// `ignore` holds names, and must outlive the filter.
  void AddRoot(const std::vector<std::string>& ignore) { ignored_.push_back(&ignore); }
  bool Wants(std::string_view name) const;
  /// Whether both are made of equal lists in the same order.
  bool operator==(const NameFilter& other) const;

 private:
  std::vector<const std::vector<std::string>*> ignored_;
};

/// The folders above the roots. They are watched too, for their own moves: a root is elsewhere when one of them moved.
class RootPassages {
 public:
  RootPassages(FolderTree& tree, KernelWatches& watches) : tree_(tree), watches_(watches) {}

  /// Marks the folders above `roots` as passages, and no others.
  void Mark(const std::vector<FolderTree::Ref>& roots);
  /// Watches those above a root, as far as that is possible, up to the next root.
  void Watch(FolderTree::Id root);

 private:
  FolderTree& tree_;
  KernelWatches& watches_;
  std::vector<FolderTree::Ref> marked_;
};

/// The roots of a watcher: their names to ignore, the folders of the tree that are there for their sake, and what
/// becomes of them when such a folder is moved or removed. A root belongs to its path: it does not move with its
/// folder.
///
/// Roots may lie in each other. The folders that several of them cover are in the tree once and have one watch; they
/// stay as long as one of these roots does and has no name on the way to them to ignore.
class RootLedger {
 public:
  using Id = FolderTree::Id;
  using Ref = FolderTree::Ref;

  /// The parts are the watcher's, and outlive this one.
  RootLedger(FolderTree& tree, KernelWatches& watches, InspectionQueue& queue)
      : tree_(tree), watches_(watches), queue_(queue), passages_(tree, watches) {}

  /// Adds a root, or begins anew with one, by a walk through its folders.
  void Add(const WatchRoot& root);
  /// Removes a root with all that was watched for its sake alone.
  void Remove(const std::string& root);
  /// Removes a root and reports that, unless it was removed already.
  void Refuse(const std::string& root, const std::string& reason, WatchListener& listener);
  /// Walks through all roots again: the kernel lost records.
  void WalkAll();

  /// All roots, in ascending order.
  std::vector<std::string> Paths() const;
  /// The roots that the folder is at or below, the innermost first.
  std::vector<std::string> PathsOver(Id id) const;
  /// The root's folder, which has no key when it could not be watched.
  Id FolderOf(const std::string& root) const { return tree_.Get(roots_.at(root).folder); }
  /// How many of the kernel's watches the root has, shared ones included.
  uint64_t Watches(const std::string& root) const;
  /// Which names in the folder `id` are watched.
  NameFilter FilterIn(Id id) const;
  /// Whether the folder `id`, on that mount, is on the mount of its innermost root; of a root itself, notes the mount.
  bool IsOnMountOfRoot(Id id, uint64_t mount);

  /// Removes a folder from the tree with all below it, or moves it there (FolderTree::Move). The roots at and below it
  /// stay at their paths and are reported as disturbed.
  void RemoveFolder(Id id, WatchListener& listener);
  void MoveFolder(Id id, Id parent, std::string_view name, WatchListener& listener);
  /// Reports the roots at and below a folder as disturbed.
  void Disturb(Id id, WatchListener& listener) const;
  /// As RootPassages::Watch; to be called for a root whose folder was inspected.
  void WatchPassages(Id root) { passages_.Watch(root); }

 private:
  struct Count {
    uint64_t at = 0;  ///< FolderTree::Changes when it was counted
    uint64_t watches = 0;
  };
  struct Root {
    std::vector<std::string> ignore;
    Ref folder;
    uint64_t mount = 0;  ///< that its folder lies on, 0 before it was inspected; folders on other mounts are left out
    mutable Count count = {};
  };

  std::vector<std::string> PathsWithin(Id id) const;
  std::vector<std::string> Detach(Id id);
  void Reattach(const std::vector<std::string>& roots, WatchListener& listener);
  void MarkPassages();
  void Prune(Id id);

  FolderTree& tree_;
  KernelWatches& watches_;
  InspectionQueue& queue_;
  RootPassages passages_;
  std::map<std::string, Root> roots_;
};

}  // namespace ferrox::notifyd
