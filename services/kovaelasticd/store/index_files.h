#pragma once

#include <cstdint>
#include <string>

namespace ferrox::engine {

// An index's folder holds "index.sqlite", SQLite's "-wal" and "-shm" beside it while it is open, the marker
// "uncommitted" while there are changes that are not committed, "index.sqlite.upgrade" during an upgrade, and
// "index.sqlite.damaged-DATE", set aside.

/// The files of the index in `folder`.
std::string IndexFile(const std::string& folder);
std::string MarkerFile(const std::string& folder);
/// What the file of an index is upgraded in, beside it.
std::string UpgradeFile(const std::string& index_file);
/// Removes it, if there is one.
void RemoveUpgradeFile(const std::string& index_file);

/// Makes the names in an index's folder durable. @throws Error kEngineStorage.
void SyncIndexFolder(const std::string& folder);
/// Makes the folder for an index. @throws Error kEngineStorage.
void MakeIndexFolder(const std::string& folder);
/// Removes an index's files, and its folder when nothing else is in it. @throws Error kEngineStorage.
void RemoveIndexFiles(const std::string& folder);
/// Whether the index's file is gone, or has no content.
bool IsIndexFileLost(const std::string& folder);
/// The nearest place above the absolute `path`, or itself, where a volume is mounted.
std::string MountPointOf(const std::string& path);
/// Gives the file at `path`, if it is there, a name with the day, for its owner alone; an earlier one goes.
/// @throws Error kEngineStorage.
void SetAside(const std::string& path, int64_t now);
/// Removes what SetAside kept.
void RemoveSetAside(const std::string& path);
/// Sets the file of a closed index aside, and removes those that belong to it. @throws Error kEngineStorage.
void SetAsideIndexFiles(const std::string& folder, int64_t now);

/// Moves the files of a closed index to another folder, also on another volume. Stopped at any moment, the index is
/// whole in the old or the new one. @throws Error kEngineStorage.
void MoveIndexFiles(const std::string& from, const std::string& to);

}  // namespace ferrox::engine
