#pragma once

#include <deque>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "services/kovanotifyd/folders/folder_tree.h"

namespace ferrox::notifyd {

/// Walks through all folders of a root, which set it up. They take place one after the other, in the order of Start.
class RootWalks {
 public:
  using Ref = FolderTree::Ref;

  /// Adds a walk that begins with the root's folder, in place of one through the same root.
  void Start(const std::string& root, Ref folder);
  void Cancel(const std::string& root);
  bool HasAny() const { return !walks_.empty(); }

  // Of the first walk:
  const std::string& Root() const { return walks_.front().root; }
  /// The next folder; nothing at the end of the walk.
  std::optional<Ref> TakeFolder();
  /// Adds folders that were found in a folder of the root, unless its walk was cancelled.
  void AddFolders(const std::string& root, const std::vector<Ref>& folders);
  void End() { walks_.pop_front(); }

 private:
  struct Walk {
    std::string root;
    std::vector<Ref> ahead;  ///< folders that were found and not yet inspected
  };

  std::deque<Walk> walks_;
};

/// What is to be compared with the disk (FolderInspector does that), and in which order: first single folders and names
/// where the tree may be wrong, then the walks that set roots up. A name may have to wait until the kernel's records
/// have all been read, when tree and disk are of the same moment; so may the report of the cookie, which comes after
/// everything that was in doubt when it was touched.
///
/// Folders and names are taken from the end: what an inspection finds below a folder is inspected before its siblings,
/// so that the queue holds the siblings along one path rather than a whole level of the tree.
class InspectionQueue {
 public:
  using Id = FolderTree::Id;
  using Ref = FolderTree::Ref;

  /// A folder that may not be the one that the tree has there. Its subfolders are listed, and follow, when it is
  /// another one, or in any case with `relist`.
  struct Folder {
    Ref folder;
    bool relist = false;
  };
  /// A name that may stand for another folder than in the tree, or for one that is not in the tree.
  struct Name {
    Ref parent;
    std::string name;
  };

  explicit InspectionQueue(FolderTree& tree) : tree_(tree) {}

  /// Adds a folder that can be inspected now.
  void AddFolder(Ref folder, bool relist) { folders_.push_back({folder, relist}); }
  /// Adds a name for when all records have been read.
  void AddNameInDoubt(Id parent, std::string_view name);
  /// A folder of the tree was inspected at its present path, or moved in the tree. If it is found to have been moved
  /// after it was inspected, then a record that was not yet read had changed its path, and it is inspected again.
  void NoteInspected(Id id) { inspected_.push_back(tree_.RefOf(id)); }
  void NoteMoved(Id id);
  /// The kernel's records have all been read: releases what waited for that.
  void OnAllRead();

  /// Whether a folder or name waits, for its turn or for the records.
  bool HasDoubts() const { return !in_doubt_.empty() || HasUrgent(); }
  bool HasWork() const { return HasDoubts() || walks_.HasAny() || cookie_ != Cookie::kNone; }
  /// Folders and names that can be inspected now; the last one added is the first. Folders come before names.
  bool HasUrgent() const { return !folders_.empty() || !names_.empty(); }
  /// Nothing when only names are left.
  std::optional<Folder> TakeFolder();
  /// There must be one.
  Name TakeName();

  /// Reports the cookie later: TakeCookie is true once, after all that is in doubt now.
  void DeferCookie() { cookie_ = Cookie::kAfterAllRead; }
  bool TakeCookie();

  RootWalks& Walks() { return walks_; }

 private:
  /// What the report of a cookie waits for.
  enum class Cookie { kNone, kAfterAllRead, kAfterInspections };

  FolderTree& tree_;
  std::vector<Folder> folders_;  ///< for TakeFolder
  std::vector<Name> names_;      ///< for TakeName
  RootWalks walks_;
  Cookie cookie_ = Cookie::kNone;

  // Since all records had last been read:
  std::vector<Name> in_doubt_;
  std::vector<Ref> inspected_;
  std::vector<Ref> moved_;  ///< those with FolderTree::kMoved
};

}  // namespace ferrox::notifyd
