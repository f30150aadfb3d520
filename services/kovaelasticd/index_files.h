#pragma once

#include <string>

namespace ferrox::engine {

/// The files of the index in `folder`.
std::string IndexFile(const std::string& folder);
std::string MarkerFile(const std::string& folder);

/// Makes the names in an index's folder durable. @throws Error kEngineStorage.
void SyncIndexFolder(const std::string& folder);
/// Makes the folder for an index. @throws Error kEngineStorage.
void MakeIndexFolder(const std::string& folder);
/// Removes an index's files, and its folder when nothing else is in it. @throws Error kEngineStorage.
void RemoveIndexFiles(const std::string& folder);
/// Moves the files of a closed index to another folder, also on another volume. Stopped at any moment, the index is
/// whole in the old or the new one. @throws Error kEngineStorage.
void MoveIndexFiles(const std::string& from, const std::string& to);

}  // namespace ferrox::engine
