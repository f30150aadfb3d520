#pragma once

#include <string_view>

#include "common/file_util.h"
#include "fileindex/folders/folder.h"

namespace ferrox::fileindex {

/// Only a path that begins with "/" names a share.
inline bool HasShare(const Folder& folder) { return StringStartWith(folder.GetPath(), "/"); }

/// Folder::GetShare() == share, without a copy; false for a folder without a share.
inline bool IsOfShare(const Folder& folder, std::string_view share) {
  const std::string_view path = folder.GetPath();
  return HasShare(folder) && path.substr(1, path.find('/', 1) - 1) == share;
}

}  // namespace ferrox::fileindex
