#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/folders/folder_port.h"
#include "services/kovanotifyd/folders/folder_tree.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Watches each folder below the roots. Folders are known by name, in a tree that the kernel's records change one after
/// the other, so that it shows the paths of the moment of a record; and by the kernel's key, which is what a record
/// names. The records may lie far behind the disk, so a folder that is opened by its path may be another than the one
/// meant: then two places lay claim to one key, or a folder looked at lies below one that a record moves later. Places
/// in doubt are looked at again once all records have been read, and reported as kUncertain where they turn out
/// different.
class FolderWatcher : public Watcher {
 public:
  struct Options {
    std::string cookie_file = {};  ///< "": without
    uint64_t watches_max = 0;      ///< 0: 80 % of the port's limit
  };

  FolderWatcher(std::unique_ptr<FolderPort> port, const Options& options);

  const char* Name() const override { return port_->Name(); }
  void Add(const WatchRoot& root) override;
  void Remove(const std::string& root) override;
  int Fd() const override { return port_->Fd(); }
  bool Read(WatchListener& listener) override;
  bool Advance(std::chrono::milliseconds at_most, WatchListener& listener) override;
  bool WatchesEachFolder() const override { return true; }
  uint64_t Watches(const std::string& root) const override;

  const FolderTree& Folders() const { return tree_; }

 private:
  using Id = FolderTree::Id;
  using Ref = FolderTree::Ref;
  static constexpr Id kNone = FolderTree::kNone;

  struct Count {
    uint64_t at = 0;  ///< of FolderTree::Changes
    uint64_t watches = 0;
  };
  struct Root {
    std::vector<std::string> ignore;
    Ref folder;
    uint64_t mount = 0;  ///< the mount that it lies on; nothing on another is entered
    mutable Count count = {};
  };
  using Roots = std::map<std::string, Root>;
  /// Everything below a root is looked at. What the disk holds there is for the comparison to find, so nothing is
  /// reported.
  struct Walk {
    std::string root;
    std::vector<Ref> ahead;
  };
  /// A folder to look at. What is below it follows where it turns out to be another folder, or always.
  struct Check {
    Ref folder;
    bool always = false;
  };
  /// A name that may stand for another folder than the tree thinks, or for one that it does not know.
  struct Place {
    Ref parent;
    std::string name;
  };
  /// Whether it was touched, and what is to be done before that is reported.
  enum class Cookie { kNone, kAfterAllRead, kAfterLooks };
  enum class Seen { kSame, kNew, kOther, kUnreadable, kGone, kRefused };

  // What the records tell: folder_records.cpp.
  void OnRecord(const FolderRecord& record, WatchListener& listener);
  void OnCookieTouched(WatchListener& listener);
  void OnRecordIn(Id parent, const FolderRecord& record, WatchListener& listener);
  void OnFileChanged(Change::Kind kind, const std::string& path, uint64_t number, WatchListener& listener);
  void OnFolderCreated(Id parent, std::string_view name, WatchListener& listener);
  void OnRenamed(const FolderRecord& record, WatchListener& listener);
  void OnMovedAway(Id parent, const FolderRecord& record, WatchListener& listener);
  void MoveFolder(Id old_parent, Id parent, const FolderRecord& record, WatchListener& listener);
  void OnUnsure(Id parent, const FolderRecord& record, WatchListener& listener);
  void OnSelf(const FolderRecord& record, WatchListener& listener);
  void OnLost(WatchListener& listener);
  void RetryUnreadable(Id folder);

  // Looking at folders: folder_looks.cpp.
  void LookAndReport(Id id, bool always, WatchListener& listener);
  Seen Look(Id id, bool always, std::vector<Ref>& below, WatchListener& listener);
  Seen Attach(Id id, int folder, WatchListener& listener);
  bool Claim(Id id, int folder, FolderKey key, WatchListener& listener);
  Seen Unwatchable(Id id, int error, WatchListener& listener);
  void ForgetGone(Id id, WatchListener& listener);
  void List(Id id, base::UniqueFd folder, std::vector<Ref>& below, WatchListener& listener);
  bool IsOnRootsMount(Id id, int folder);
  void CheckPlace(const Place& place, WatchListener& listener);

  // The roots, and what is watched for their sake: folder_roots.cpp.
  uint64_t CountWatches(Id top) const;
  std::vector<std::string> RootsOver(Id id) const;
  std::vector<std::string> RootsWithin(Id id) const;
  bool IsCovered(Id id) const;
  bool LeadsToRoot(Id id) const { return tree_.Has(id, FolderTree::kRoot) || tree_.Has(id, FolderTree::kPassage); }
  std::vector<Ref> Children(Id id) const;
  std::vector<const std::vector<std::string>*> IgnoredIn(Id id) const;
  bool HaveSameRules(Id a, Id b) const;
  bool IsWanted(Id parent, std::string_view name) const;
  void RemoveFolder(Id id, WatchListener& listener);
  std::vector<std::string> DetachRoots(Id id);
  void ReattachRoots(const std::vector<std::string>& roots, WatchListener& listener);
  void Disturb(Id id, WatchListener& listener);
  void Refuse(const std::string& root, const std::string& reason, WatchListener& listener);
  void MarkPassages();
  void WatchPassages(Id root);
  void Prune(Id id);
  void DropKey(Id id);
  void StartWalk(const std::string& root);

  // What takes time: folder_watcher.cpp.
  bool HasWork() const;
  void Step(WatchListener& listener);
  void StepWalk(WatchListener& listener);
  void UnwatchDead();
  bool IsAllRead() const;
  void OnAllRead();
  bool IsMoved(Id id) const;

  std::unique_ptr<FolderPort> port_;
  uint64_t watches_max_ = 0;
  FolderKey cookie_folder_ = 0;
  std::string cookie_name_;
  Cookie cookie_ = Cookie::kNone;

  FolderTree tree_;
  Roots roots_;
  std::vector<Ref> passages_;
  std::vector<Ref> unreadable_;

  // What Advance goes on with:
  std::vector<std::pair<FolderKey, std::string>> dead_;  ///< watches of folders that left the tree
  std::vector<Check> checks_;
  std::vector<Place> places_;
  std::deque<Walk> walks_;

  // Since all records had last been read:
  std::vector<Ref> looked_at_;
  std::vector<Ref> moved_;
  std::vector<Place> doubts_;

  std::vector<FolderRecord> records_;
};

}  // namespace ferrox::notifyd
