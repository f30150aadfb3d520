#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "services/kovanotifyd/folders/folder_inspector.h"
#include "services/kovanotifyd/folders/folder_port.h"
#include "services/kovanotifyd/folders/folder_record_translator.h"
#include "services/kovanotifyd/folders/folder_tree.h"
#include "services/kovanotifyd/folders/inspection_queue.h"
#include "services/kovanotifyd/folders/kernel_watches.h"
#include "services/kovanotifyd/folders/root_ledger.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Watches each folder below the roots by a watch of its own, which needs no privileges but takes some 100 bytes here
/// and 1 KiB in the kernel for each folder, and a walk through all of them before a root is covered.
///
/// Read takes records from the port, and FolderRecordTranslator turns them into changes, with the help of a FolderTree:
/// it has the folders by name, and shows the paths of the moment of the record, since the records change it one after
/// the other; and by the kernel's key, which is what a record names. Advance does the rest: FolderInspector compares
/// folders with the disk, in the order of the InspectionQueue.
///
/// The records may lie far behind the disk, so a folder that is opened by its path may be another one than the record
/// meant: then two places of the tree get the same key, or a folder is inspected whose path a later record changes.
/// For example, "a" is made, renamed to "b", and a new "a" is made. At the record of the first "a" the path "a" leads
/// to the second one, which is watched in its place; the rename then moves it to "b" in the tree, and the first folder
/// has no watch at all. So each rename puts both its names in doubt. Places in doubt are inspected again once all
/// records have been read, and reported as kUncertain if they are found to be different.
class FolderWatcher : public Watcher {
 public:
  struct Options {
    std::string cookie_file = {};  ///< "": without
    uint64_t watches_max = 0;      ///< 0: 80 % of the port's limit
  };

  /// `port` is open and watches nothing. A cookie that cannot be watched is logged; syncs then run into their time-out.
  FolderWatcher(std::unique_ptr<FolderPort> port, const Options& options);

  // As in Watcher:
  const char* Name() const override { return port_->Name(); }
  void Add(const WatchRoot& root) override { roots_.Add(root); }
  void Remove(const std::string& root) override { roots_.Remove(root); }
  int Fd() const override { return port_->Fd(); }
  bool Read(WatchListener& listener) override;
  bool Advance(std::chrono::milliseconds at_most, WatchListener& listener) override;
  bool WatchesEachFolder() const override { return true; }
  uint64_t Watches(const std::string& root) const override { return roots_.Watches(root); }

  /// For tests.
  const FolderTree& Folders() const { return tree_; }

 private:
  void WatchCookie(const std::string& file);
  bool HasWork() const { return watches_.HasDropped() || queue_.HasWork(); }
  void Step(WatchListener& listener);

  // Each part may use those before it.
  std::unique_ptr<FolderPort> port_;
  FolderTree tree_;
  KernelWatches watches_;
  InspectionQueue queue_;
  RootLedger roots_;
  FolderInspector inspector_;
  FolderRecordTranslator translator_;
  std::vector<FolderRecord> records_;  ///< of the Read under way; kept for its memory
};

}  // namespace ferrox::notifyd
