#pragma once

#include <string>
#include <vector>

#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/filesystem/filesystem_marks.h"
#include "services/kovanotifyd/filesystem/folder_locator.h"
#include "services/kovanotifyd/filesystem/linked_files.h"
#include "services/kovanotifyd/filesystem/mounted_folders.h"
#include "services/kovanotifyd/filesystem/path_finder.h"
#include "services/kovanotifyd/filesystem/record_queue.h"
#include "services/kovanotifyd/filesystem/rename_history.h"
#include "services/kovanotifyd/filesystem/watched_roots.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Recognizes the second record of an exchange of two names: it is the mirror image of the record just before it, of
/// another file or folder.
class ExchangeDetector {
 public:
  /// Whether the rename is the second record of an exchange. Notes it as the last one.
  bool IsSecond(const FanRecord& record);
  /// Another record came between.
  void Clear() { has_last_ = false; }

 private:
  bool has_last_ = false;                   ///< whether the last record was a rename
  HandleKey folder_, new_folder_, target_;  ///< of the last record; views of names would not outlive its batch
  std::string name_, new_name_;
};

/// Turns the kernel's records for whole file systems into changes, in their order. A record names its folder by a key;
/// the paths are those of the moment of the record (PathFinder), none for a name outside of all roots.
///
/// A record may stand for several changes of one name and object, which the kernel joined. A deletion is
/// reported first. What else the record says follows if the name was not deleted, or is on disk again.
///
/// Every move of a folder goes to the FolderLocator, also outside of all roots: it may lead into one later.
class FanRecordTranslator {
 public:
  /// What the translator shares with the watcher.
  struct Parts {
    FilesystemMarks& marks;  ///< which record is that of the cookie; what the kernel is to leave out
    MountedFolders& mounts;  ///< whether a name is on disk
    RecordQueue& queue;      ///< learns of folders that were made and removed at once
    FolderLocator& locator;  ///< learns of folders that were made or moved
    PathFinder& finder;      ///< the paths of a name
    WatchedRoots& roots;     ///< which roots a folder is above
    RenameHistory& history;  ///< learns of names that may come back
    LinkedFiles& linked;     ///< whether a change is to be reported by the file's number
  };

  /// The parts are the watcher's, and outlive this one.
  explicit FanRecordTranslator(const Parts& parts) : parts_(parts) {}

  /// Not for a record that says that others were lost.
  void Translate(const FanRecord& record, WatchListener& listener);

 private:
  void TranslateName(const FanRecord& record, WatchListener& listener);
  void NoteNewFolder(const FanRecord& record);
  bool ReportDeleted(const FanRecord& record, WatchListener& listener);
  void TranslateRename(const FanRecord& record, WatchListener& listener);
  void ReportRename(const FanRecord& record, WatchListener& listener);
  void ReportByNumber(const FanRecord& record, WatchListener& listener);
  void ReportLinks(const FanRecord& record, WatchListener& listener);
  void ReportNumber(const FanRecord& record, Change::Kind kind, uint64_t file, WatchListener& listener);
  void ReportAboveRoots(const FanRecord& record, WatchListener& listener);

  Parts parts_;
  ExchangeDetector exchanges_;
  std::vector<std::string> paths_;      ///< of the record's name; of a rename, the old one
  std::vector<std::string> new_paths_;  ///< of the new name of a rename
};

}  // namespace ferrox::notifyd
