#pragma once

#include <memory>
#include <string>

#include <json/value.h>

#include "base/path.h"
#include "fileindex/folders/folder_mgr.h"

/// What the notification daemon is asked to watch for a share. The management operations register it when folders
/// change; the index daemon registers it, too, where it finds another list than this. Inline, since both need the same
/// text and the library shows no function for it: a registration replaces the one before, and with two texts each would
/// undo the other's. docs/formats/notifyd.md describes the document and the bits of the mask.
namespace ferrox::fileindex {

/// The application under which registrations are made. A later one of the same queue and application replaces the
/// earlier.
inline constexpr char kAppName[] = "fileindex";
/// The set of changes that are reported (kova/notifyd.h): content, attributes, creation, deletion and renames.
inline constexpr int kWatchedChanges = 0xFFC6;
/// Folders of this name are never watched: the platform's own, which lie beside the files of users.
inline constexpr char kNeverWatched[] = "@eaDir";

/// The document of a registration (kova/notifyd.h): each folder that `folder_mgr` has of the share, in its order, with
/// all below it; what changes there is reported into the queue at `queue_path`. Paused folders are in it, too. `share`
/// is the name alone: "photo". A share without folders has the same document with an empty list:
///   {"queue": "/var/lib/kova/fileindex/queue/volume1+photo.queue",
///    "config": [{"path": "/volume1/photo/trip", "mask": 65478, "ignore": ["@eaDir"]}]}
/// Registers nothing. The folders' full paths are asked of the platform under SDKMutex() (common/sdk_mutex.h), which
/// the caller must not hold; that may block for the disk.
/// @throws Error kNoSuchShare when the share has folders and does not exist.
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
