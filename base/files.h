#pragma once

#include <dirent.h>
#include <sys/types.h>

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

#include "base/unique_fd.h"

/// Files and folders as a whole. Nothing here throws, logs or waits for anything but the disk: a failure is false, with
/// errno. Calls that a signal interrupts go on.
namespace base {

/// Writes all of `data`; what was written before a failure stays.
bool WriteAll(int fd, std::string_view data);

/// Appends the rest of the file to `text`. More than `limit_bytes` of it fail (EFBIG); `text` then holds a part.
bool ReadAll(int fd, std::string& text, size_t limit_bytes = static_cast<size_t>(-1));

/// Reads a regular file as a whole into `content`; what is something else fails (EINVAL), and is not waited for.
bool ReadWholeFile(const std::string& path, std::string& content);

/// An open folder that ends with its owner.
struct FolderClose {
  void operator()(DIR* folder) const { (void)closedir(folder); }
};
using OpenFolderPtr = std::unique_ptr<DIR, FolderClose>;

/// Makes the names in `folder` durable.
bool SyncFolder(const std::string& folder);

/// Makes a folder and those missing above it, all with `mode`. True also when another process made them meanwhile, and
/// when something stands at `path` that is no folder.
bool MakeFolders(const std::string& path, mode_t mode = 0755);
/// The same, and each folder that was made survives a crash of the machine afterwards. Needs folders that can be read.
bool MakeFoldersDurably(const std::string& path, mode_t mode);

/// What a file has besides its content; `mode` is the permission bits.
struct FileAttributes {
  mode_t mode;
  uid_t uid;
  gid_t gid;
  bool needs_owner;  ///< whether it is a failure when the caller may not give the file to that owner
};

/// Replaces the file at `path`, so that a crash at any moment leaves the old one or the new one: `temporary`, a new
/// file in the same folder that is open as `file`, gets the content and the attributes, is synced and renamed, and the
/// folder synced. On failure `temporary` is removed and `path` as before, unless it was only the folder that could not
/// be synced.
bool ReplaceFile(const std::string& path, std::string_view content, const FileAttributes& attributes, UniqueFd file,
                 const std::string& temporary);

}  // namespace base
