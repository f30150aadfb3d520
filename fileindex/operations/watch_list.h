#pragma once

#include <memory>
#include <string>

#include <json/value.h>

#include "base/path.h"
#include "fileindex/folders/folder_mgr.h"

/// What the notification daemon is asked to watch for a share. Inline: of use to whoever keeps registrations in step
/// with the folders, without being one of the library's functions.
namespace ferrox::fileindex {

/// The application that registers.
inline constexpr char kAppName[] = "fileindex";
/// Content, attributes, creation, deletion and renames.
inline constexpr int kWatchedChanges = 0xFFC6;
/// Folders of this name are never watched.
inline constexpr char kNeverWatched[] = "@eaDir";

/// The document of a registration (kova/notifyd.h): each folder that `folder_mgr` has of the share, in its order,
/// reported into the queue at `queue_path`.
inline Json::Value WatchListOf(const std::string& share, const std::string& queue_path, const FolderMgr& folder_mgr) {
  Json::Value document(Json::objectValue);
  document["queue"] = queue_path;
  Json::Value& config = document["config"] = Json::Value(Json::arrayValue);
  for (const std::shared_ptr<Folder>& folder : folder_mgr.GetFolders()) {
    if (!base::IsAtOrBelow(folder->GetPath(), "/" + share)) continue;
    Json::Value watch(Json::objectValue);
    watch["path"] = folder->GetFullPath();
    watch["mask"] = kWatchedChanges;
    watch["ignore"].append(kNeverWatched);
    config.append(watch);
  }
  return document;
}

}  // namespace ferrox::fileindex
