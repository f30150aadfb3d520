#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <vector>

#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/filesystem/fan_record_translator.h"
#include "services/kovanotifyd/filesystem/filesystem_marks.h"
#include "services/kovanotifyd/filesystem/folder_cache.h"
#include "services/kovanotifyd/filesystem/folder_locator.h"
#include "services/kovanotifyd/filesystem/linked_files.h"
#include "services/kovanotifyd/filesystem/mounted_folders.h"
#include "services/kovanotifyd/filesystem/path_finder.h"
#include "services/kovanotifyd/filesystem/record_queue.h"
#include "services/kovanotifyd/filesystem/rename_history.h"
#include "services/kovanotifyd/filesystem/watched_roots.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Watches roots by one mark for each file system that has some, so that a root costs the same however many folders it
/// has. That takes CAP_SYS_ADMIN for the marks, and CAP_DAC_READ_SEARCH to open folders by the handles in records,
/// which tell their paths. The kernel then reports everything on the file system. What lies outside of all roots is
/// dropped here, unless it may be a change of a file that has another name in a root (LinkedFiles); what lies in the
/// daemons' own folders the kernel mostly leaves out (FilesystemMarks). Names to ignore are reported all the same.
///
/// Read takes records from the kernel (RecordQueue); FanRecordTranslator turns each into changes, with the paths of the
/// moment of the record, however far the reader is behind (FolderLocator). Only a name to which something came back
/// while records were waiting can be reported wrongly; it is then also reported as kUncertain (RenameHistory).
class FilesystemWatcher : public Watcher {
 public:
  struct Options {
    std::string cookie;                           ///< path of the cookie file; its folder is marked
    std::vector<std::string> quiet_folders = {};  ///< where the daemons keep their own files
    size_t folders_max = 16384;                   ///< whose places are kept in memory
    size_t records_max = 65536;                   ///< that are read ahead; when there are more, changes count as lost
  };

  /// Opens nothing: what the kernel refuses is reported for each root.
  explicit FilesystemWatcher(const Options& options);

  // As in Watcher:
  const char* Name() const override { return "fanotify"; }
  void Add(const WatchRoot& root) override;
  void Remove(const std::string& root) override;
  int Fd() const override { return group_.Fd(); }
  bool Read(WatchListener& listener) override;
  bool Advance(std::chrono::milliseconds at_most, WatchListener& listener) override;
  uint64_t Watches(const std::string& root) const override { return roots_.Has(root) ? 1 : 0; }

 private:
  // "", or why the root cannot be watched.
  std::string Begin(const std::string& root);
  std::string Locate(const std::string& root, const HandleKey& key);
  void ReleaseUnused(const HandleKey& key);
  void TranslateWindow(WatchListener& listener);
  void ReportDoubts(WatchListener& listener);
  void OnLost(WatchListener& listener);
  void Rest();

  // Each part may use those before it.
  FanGroup group_;  ///< opened with the first root
  MountedFolders mounts_;
  FilesystemMarks marks_;
  RecordQueue queue_;
  FolderCache cache_;
  FolderLocator locator_;
  WatchedRoots roots_;
  PathFinder finder_;
  RenameHistory history_;
  LinkedFiles linked_;
  FanRecordTranslator translator_;
  std::map<std::string, WatchRoot> to_add_;  ///< roots that Advance is to begin with
};

}  // namespace ferrox::notifyd
