#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "services/kovanotifyd/filesystem/folder_locator.h"
#include "services/kovanotifyd/filesystem/watched_roots.h"
#include "services/kovanotifyd/watcher.h"

namespace ferrox::notifyd {

/// Gives the full paths of names in folders that records name by their keys, at the moment of the record.
class PathFinder {
 public:
  PathFinder(FolderLocator& locator, WatchedRoots& roots) : locator_(locator), roots_(roots) {}

  /// As WatchedRoots::FullPaths. Of a folder whose place cannot be found out there are no paths, and all roots on its
  /// file system are reported as uncertain.
  bool Find(const HandleKey& folder, std::string_view name, std::vector<std::string>& paths, WatchListener& listener);
  /// Reports all roots on the key's file system as uncertain, since a change may be anywhere there; once until Reset.
  void ReportUncertain(const HandleKey& key, WatchListener& listener);
  /// All records that were read have been worked on.
  void Reset() { has_reported_ = false; }

 private:
  FolderLocator& locator_;
  WatchedRoots& roots_;
  bool has_reported_ = false;
};

}  // namespace ferrox::notifyd
