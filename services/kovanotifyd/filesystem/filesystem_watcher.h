#pragma once

#include <map>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/filesystem/folder_cache.h"
#include "services/kovanotifyd/filesystem/folder_locator.h"
#include "services/kovanotifyd/filesystem/linked_files.h"
#include "services/kovanotifyd/filesystem/mounted_folders.h"
#include "services/kovanotifyd/filesystem/record_window.h"
#include "services/kovanotifyd/filesystem/rename_history.h"
#include "services/kovanotifyd/filesystem/watched_roots.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Watches roots by one mark for each file system that they are on, so that a root costs nothing however many folders
/// it has. The kernel then tells of everything on the file system; what is outside of all roots is dropped here,
/// unless it may be a change of a file with another name below a root (LinkedFiles), and what is in the daemons' own
/// folders mostly before it gets here. Names to ignore are reported all the same. Paths are
/// those of the moment of each change, however far the reader is behind (FolderLocator). Only names to which something
/// returned while records were waiting can be told wrongly; they are then reported as kUncertain.
class FilesystemWatcher : public Watcher, private FolderSource {
 public:
  struct Options {
    std::string cookie;                           ///< a file's path; its folder is marked
    std::vector<std::string> quiet_folders = {};  ///< where the daemons keep their own files
    size_t folders_max = 16384;                   ///< whose places are kept in memory
    size_t records_max = 65536;  ///< read and not yet worked through; beyond these, changes count as lost
  };

  explicit FilesystemWatcher(Options options);
  ~FilesystemWatcher() override;

  const char* Name() const override { return "fanotify"; }
  void Add(const WatchRoot& root) override;
  void Remove(const std::string& root) override;
  int Fd() const override { return group_.Fd(); }
  bool Read(WatchListener& listener) override;
  bool Advance(std::chrono::milliseconds at_most, WatchListener& listener) override;
  uint64_t Watches(const std::string& root) const override { return roots_.Has(root) ? 1 : 0; }

 private:
  using Folder = FolderCache::Folder;
  using Paths = std::vector<std::string>;

  // Setting up.
  std::string Begin(const std::string& root);
  std::string OpenGroup();
  std::string MarkFileSystem(const std::string& root, int folder, const HandleKey& key);
  void ReleaseFileSystem(const HandleKey& key);
  void FindQuietFolders();

  // The queue of records.
  Answer ReadPlace(const HandleKey& folder, FolderPlace& place) override;
  void Drain(RecordWindow& window) override;
  bool ReadBatch();
  void WorkThroughWindow(WatchListener& listener);
  void Rest();
  void Settle(WatchListener& listener);
  void Lose(WatchListener& listener);

  // One record.
  void Take(const FanRecord& record, WatchListener& listener);
  void TakeRename(const FanRecord& record, WatchListener& listener);
  void TellByNumber(const FanRecord& record, WatchListener& listener);
  void TakeName(const FanRecord& record, WatchListener& listener);
  void Disturb(const FanRecord& record, WatchListener& listener);
  void Silence(const FanRecord& record);
  bool FindPaths(const HandleKey& folder, std::string_view name, Paths& paths, WatchListener& listener);
  bool IsExchange(const FanRecord& record) const;
  void TellUnknown(const HandleKey& folder, WatchListener& listener);

  const Options options_;
  FanGroup group_;
  MountedFolders mounts_;
  FolderCache cache_;
  RecordWindow window_;
  FolderLocator locator_;
  WatchedRoots roots_;
  RenameHistory history_;
  LinkedFiles linked_;

  std::map<std::string, WatchRoot> to_add_;
  /// Folders that were told to be made and removed by one record, while what was done in them is still to come.
  std::unordered_map<HandleKey, FolderPlace> removed_;
  HandleKey cookie_folder_;
  std::string cookie_name_;
  FanRecord last_rename_;           ///< without names, which would outlive their batch,
  std::string last_names_[2] = {};  ///< but with these
  bool can_ignore_ = true;
  bool is_overrun_ = false;
  bool was_burst_ = false;
  bool told_unknown_ = false;
  Paths paths_;
  Paths new_paths_;
};

}  // namespace ferrox::notifyd
