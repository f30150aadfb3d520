#pragma once

#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/folders/folder_tree.h"
#include "services/kovanotifyd/folders/inspection_queue.h"
#include "services/kovanotifyd/folders/kernel_watches.h"
#include "services/kovanotifyd/folders/root_ledger.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Compares folders of the tree with the disk, one at a time: opens the folder at its path, watches it, and lists it
/// afterwards, so that nothing that is made in it later can be missed. Works through an InspectionQueue, and adds to it
/// what comes to be in doubt.
///
/// The kernel's key shows which folder was opened: if it is the key that the tree has at that place, nothing is wrong;
/// if another place of the tree has it, the folder was moved by a record that was not yet read, and the other place is
/// inspected too. Folders on another mount than their root's are left out of the tree.
class FolderInspector {
 public:
  using Id = FolderTree::Id;
  using Ref = FolderTree::Ref;

  /// The parts are the watcher's, and outlive this one.
  FolderInspector(FolderTree& tree, KernelWatches& watches, RootLedger& roots, InspectionQueue& queue)
      : tree_(tree), watches_(watches), roots_(roots), queue_(queue) {}

  /// Inspects a folder that is new in the tree, or may be another one than before, and reports it if it is. The folders
  /// in it are added to the queue. `id` may be gone afterwards.
  void InspectAndReport(Id id, bool relist, WatchListener& listener);
  /// Does the next thing in the queue that is urgent, or the next folder of the walk under way. What a walk finds is
  /// not reported: the comparison that follows OnCovered finds it too.
  void InspectNext(WatchListener& listener);
  void ContinueWalk(WatchListener& listener);
  /// The permissions of a folder changed: inspects those of it and the folders in it that could not be opened; for the
  /// top, all of these.
  void RetryUnreadable(Id folder);

 private:
  /// What an inspection finds at a folder's path, compared with the tree.
  enum class Finding {
    kSame,        ///< the folder that the tree has there
    kNew,         ///< a folder where the tree had none that is watched
    kOther,       ///< another folder
    kUnreadable,  ///< a folder that cannot be opened; it stays in the tree without a key
    kGone,        ///< nothing that belongs into the tree
    kRefused,     ///< it cannot be watched, and so neither can the roots over it
  };

  Finding Inspect(Id id, bool relist, std::vector<Ref>& below, WatchListener& listener);
  Finding Watch(Id id, int folder, WatchListener& listener);
  bool TakeOverKey(Id id, int folder, FolderKey key, WatchListener& listener);
  Finding OnFailure(Id id, int error, WatchListener& listener);
  void RemoveGone(Id id, WatchListener& listener);
  void MarkUnreadable(Id id);
  void List(Id id, base::UniqueFd folder, std::vector<Ref>& below, WatchListener& listener);
  void InspectName(const InspectionQueue::Name& name, WatchListener& listener);

  FolderTree& tree_;
  KernelWatches& watches_;
  RootLedger& roots_;
  InspectionQueue& queue_;
  std::vector<Ref> unreadable_;  ///< some may be readable or gone by now
};

}  // namespace ferrox::notifyd
