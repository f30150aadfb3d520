#pragma once

#include <string>
#include <vector>

#include <json/forwards.h>

#include <kova/recycle.h>

#include "common/export.h"

/// The management operations: what is indexed, and how the index follows shares, volumes and users. Each loads the
/// configuration, changes it, has the engine and the daemons follow, and queues events; none indexes a file itself.
/// An operation first checks, then carries out its steps in a fixed order. A step that fails ends it: what stands
/// before the step stays done, and OperationError (operation_error.h), with the step's code and reason, says what is
/// not done; so does the log. Asking for the same again once the cause is gone finishes it. Unless they say that they
/// throw nothing, each may throw besides the codes named kLoadFailed, kSaveFailed, kInternal, kEngineUnreachable and
/// the engine's own codes.
namespace ferrox::fileindex {

/// Add folders (an array in the stored form, docs/formats/folders.md), or change those that exist and add the others.
/// All or none: whatever an element throws leaves the folders file as it was. Holds the folder lock (waits at most
/// about 58 s for it). With `updater_mode` nothing asks whether a path can be indexed and no event is queued.
/// @throws Error kBadArgument; kPathNotIndexable "Path cannot index: <path>"; kTooManyFolders; kNoSuchShare;
/// kSpaceNotEnough "Share (<name>) space not enough"; kLockFailed; FolderAdd kDuplicatedFolder "Duplicated ID: <path>".
FERROX_EXPORT void FolderAdd(const Json::Value& folder_list, bool updater_mode);
FERROX_EXPORT void FolderSet(const Json::Value& folder_list, bool updater_mode);

/// Has folders (an array of share paths) compared with the index again; a share whose index must be rebuilt is indexed
/// anew as a whole. Paths of shares without folders are skipped. Events queued before a later element throws stay.
/// @throws Error kBadArgument; kNoSuchShare.
FERROX_EXPORT void FolderReindex(const Json::Value& path_list);

/// Removes folders (an array of share paths), all or none. A share whose last folder goes loses its index, its queue
/// and its watches; with the last folder of all the services stop. Of a share that is gone only the index and the
/// status bits can be removed. Holds the folder lock.
/// @throws Error kBadArgument; kNoSuchFolder; kLockFailed.
FERROX_EXPORT void FolderDelete(const Json::Value& path_list);

/// The stored form of one folder. @throws Error kNoSuchFolder.
FERROX_EXPORT void FolderGet(Json::Value& out, const std::string& path);
/// One page of the folders, sorted as FolderMgr::List does: {"folder": [...], "total", "offset"}, each with the
/// `additional` blocks (an array of names, Folder::GetDataWithAdditional). A folder of which a block cannot be made is
/// left out.
FERROX_EXPORT void FolderList(Json::Value& out, unsigned int offset, unsigned int limit, const std::string& sort_by,
                              const std::string& sort_direction, const Json::Value& additional);

/// The following throw kBadArgument "Missing ..." for an empty argument, before anything is changed.

/// The platform has renamed a share: its folders, its index and its documents follow. @throws Error kNoSuchShare when
/// there is no share `share_to`; the folders have been renamed then.
FERROX_EXPORT void ShareRename(const std::string& share_from, const std::string& share_to);
/// The platform has moved a share's folder from `path_from` to `path_to`, both absolute; its index follows.
FERROX_EXPORT void ShareMigrate(const std::string& share_name, const std::string& path_from,
                                const std::string& path_to);
/// Stop and start the indexing and watching of a share, and its index; changes of the meantime wait in its queue.
/// Nothing happens for a share without folders.
FERROX_EXPORT void SharePause(const std::string& share_name);
FERROX_EXPORT void ShareResume(const std::string& share_name);
/// A paused share will not come back: its folders, its queue and its index are removed.
FERROX_EXPORT void ShareClearPaused(const std::string& share_name, const std::string& share_path);
/// Queues a comparison of the share's recycle bin, after it was switched on or off. May be called with any share, and
/// does nothing when the share's folder is missing or a link. @throws Error kNoSuchShare; as AddCustomEvent does.
FERROX_EXPORT void ShareCheckRecycle(const std::string& share_name);

/// The volume mounted at `mount_point` goes away, comes back, or will not come back.
FERROX_EXPORT void VolumePause(const std::string& mount_point);
FERROX_EXPORT void VolumeResume(const std::string& mount_point);
FERROX_EXPORT void VolumeClearPaused(const std::string& mount_point);

/// The home service was switched on for one kind of accounts, or off: the recycle bins of the homes, of that kind or of
/// all, are compared again. Throws no Error: the first failure is logged and ends it.
FERROX_EXPORT void HomeEnable(AUTH_TYPE auth);
FERROX_EXPORT void HomeDisable(AUTH_TYPE auth);
/// The platform has renamed a user, and with it the folder in the share "homes": the folders there and the documents
/// follow. @throws Error kNoSuchShare when there is no share "homes"; the folders have been renamed then.
FERROX_EXPORT void UserRename(const std::string& user_from, const std::string& user_to);

/// Starts the services that indexing needs when a folder is configured, else stops them. Failures are logged only.
/// @throws Error kLoadFailed; kBadArgument.
FERROX_EXPORT void PrepareServices();
/// Rebuilds the term suggestions of those of the index databases that belong to shares with folders, in the order of
/// the shares. @throws Error kNoSuchShare when such a share is gone; kSpaceNotEnough.
FERROX_EXPORT void UpdateTermSuggestion(const std::vector<std::string>& db_names);

}  // namespace ferrox::fileindex
