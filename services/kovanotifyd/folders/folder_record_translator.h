#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "services/kovanotifyd/folders/folder_inspector.h"
#include "services/kovanotifyd/folders/folder_port.h"
#include "services/kovanotifyd/folders/folder_tree.h"
#include "services/kovanotifyd/folders/inspection_queue.h"
#include "services/kovanotifyd/folders/root_ledger.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Turns the kernel's records into changes, in their order: each record first finds its folder in the tree by the key,
/// which gives the path of that moment, and then changes the tree as it says. Where tree and disk may differ after
/// that, since the disk is ahead of the records, the names go to the inspection queue.
///
/// Most records become one change. Others are:
///   - a new folder, which is watched and listed first, so that its change stands for all that was made in it before
///   - a rename with one side that is not watched, which is a creation or a deletion
///   - a write to a file with several names, or whose name is gone, which is also reported by the file's number
///   - records of a folder itself and of lost records, which become OnRootDisturbed and OnLost
class FolderRecordTranslator {
 public:
  /// The cookie file: the key of its folder, 0 without, and its name there.
  struct CookieFile {
    FolderKey folder = 0;
    std::string name = {};
  };

  /// The parts are the watcher's, and outlive this one.
  FolderRecordTranslator(FolderTree& tree, RootLedger& roots, FolderInspector& inspector, InspectionQueue& queue)
      : tree_(tree), roots_(roots), inspector_(inspector), queue_(queue) {}

  /// To be called before the first record.
  void SetCookie(CookieFile cookie) { cookie_ = std::move(cookie); }
  /// Reports what the record says, and brings the tree to the moment after it.
  void Translate(const FolderRecord& record, WatchListener& listener);

 private:
  using Id = FolderTree::Id;

  // `parent` is the folder that has the record's name, covered by a root.
  bool IsCookie(const FolderRecord& record) const;
  Id CoveredFolder(FolderKey key) const;
  void OnCookieTouched(WatchListener& listener);
  void OnRecordIn(Id parent, const FolderRecord& record, WatchListener& listener);
  void OnFileChanged(Change::Kind kind, const std::string& path, uint64_t number, WatchListener& listener);
  void OnFolderCreated(Id parent, std::string_view name, WatchListener& listener);
  void OnUncertain(Id parent, const FolderRecord& record, WatchListener& listener);
  void OnRenamed(const FolderRecord& record, WatchListener& listener);
  void OnMovedAway(Id parent, const FolderRecord& record, WatchListener& listener);
  void MoveFolder(Id old_parent, Id parent, const FolderRecord& record, WatchListener& listener);
  void OnFolderItself(const FolderRecord& record, WatchListener& listener);

  FolderTree& tree_;
  RootLedger& roots_;
  FolderInspector& inspector_;
  InspectionQueue& queue_;
  CookieFile cookie_;
};

}  // namespace ferrox::notifyd
