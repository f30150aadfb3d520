#pragma once

#include <string>

namespace ferrox::fileindex {

class FolderMgr;

/// The file of patterns that leave files out of indexed folders (docs/exclusions.md) follows what becomes of these.
/// Without that file nothing happens. Patterns of a path that is no indexed folder leave nothing out.

/// Before the folders at and below the share path `from` are saved under `to`: their patterns hold there as well, so
/// that no folder is indexed without them. @throws Error kLoadFailed; kSaveFailed; kCredentialsFailed.
void CopyFolderPatterns(const std::string& from, const std::string& to);

/// After the folders were saved: removes the patterns of paths that are none of them. A failure is logged alone.
void DropFolderPatterns(const FolderMgr& folder_mgr);

}  // namespace ferrox::fileindex
