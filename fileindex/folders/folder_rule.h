#pragma once

#include <array>
#include <string>
#include <string_view>

#include "base/path_table.h"
#include "fileindex/folders/folder.h"
#include "fileindex/util.h"

/// The rule by which indexed folders decide about paths: which folder governs a path, and whether the content of a file
/// there is read. The list of folders (FolderMgr) and the index daemon, which holds the folders of one share at a time,
/// both ask here, so that what an operation announces is what the daemon does. Paths are compared by whole components
/// and byte by byte: "/photo/b" governs nothing below "/photo/bc". Inline, so that the library shows no symbol for it.
namespace ferrox::fileindex {

/// Of which kinds of files a folder has the content indexed, one flag for each FileType below FILE_TYPE_OTHER.
using ContentKinds = std::array<bool, FILE_TYPE_OTHER>;

/// The names of these flags in a stored folder, in the same order.
inline constexpr std::array<const char*, FILE_TYPE_OTHER> kContentKindNames = {"document", "audio", "video", "photo"};

/// The flags of one entry.
inline ContentKinds KindsOf(const Folder& folder) {
  return {folder.IsDocument(), folder.IsAudio(), folder.IsVideo(), folder.IsPhoto()};
}

/// The entry that governs a full path, of a table by full path: the deepest one at or above it. A deeper entry replaces
/// those above it as a whole; their kinds are not joined. Null when there is none: the path is not indexed then. What
/// keeps a path out by its name or its place (a recycle bin, a snapshot, a mount point) is decided elsewhere:
/// CanFullPathBeIndexed. Costs one look into the table for each component of the path, however many entries there are.
template <typename Entry>
const Entry* Governing(const base::PathTable<Entry>& by_full_path, std::string_view full_path) {
  const Entry* deepest = nullptr;
  by_full_path.VisitUpwards(full_path, [&deepest](const Entry& entry) {
    deepest = &entry;
    return true;
  });
  return deepest;
}

/// Whether the content of the file at `path` is read where `governing` are the kinds of the folder that governs it.
/// Goes by the extension alone. A file of none of the four kinds is read in every indexed folder.
inline bool WantsContent(const ContentKinds& governing, const std::string& path) {
  const FileType type = GetFileTypeByFullPath(path);
  return type == FILE_TYPE_OTHER || governing[static_cast<size_t>(type)];
}

}  // namespace ferrox::fileindex
