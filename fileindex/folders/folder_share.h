#pragma once

#include <string_view>

#include "common/file_util.h"
#include "fileindex/folders/folder.h"

namespace ferrox::fileindex {

/// To which share an entry of the list belongs, where asking Folder::GetShare would throw or copy.

/// Whether the entry names a share: only a path that begins with "/" does. The file may hold others, which govern
/// nothing and can only be listed and deleted.
inline bool HasShare(const Folder& folder) { return StringStartWith(folder.GetPath(), "/"); }

/// Folder::GetShare() == share, without a copy; false for a folder without a share.
inline bool IsOfShare(const Folder& folder, std::string_view share) {
  const std::string_view path = folder.GetPath();
  return HasShare(folder) && path.substr(1, path.find('/', 1) - 1) == share;
}

}  // namespace ferrox::fileindex
