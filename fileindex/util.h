#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

#include <json/forwards.h>

#include "common/export.h"
#include "common/file_util.h"

/// Path rules and file types. A share path begins with "/" and the share's name ("/photo/a.jpg"); the full path of the
/// same file is absolute ("/volume1/photo/a.jpg").
namespace ferrox::fileindex {

/// Published here once, and so still to be had under this name; they are those of common/file_util.h.
using ferrox::Basename;
using ferrox::Dirname;
using ferrox::GetFileExtension;
using ferrox::StringStartWith;

/// 7 makes the library log every queue line that it reads; any other value does not. For the whole process; set it
/// before threads read queues.
extern FERROX_EXPORT int log_level;

/// The kind of a file. The first four are those whose content a folder has indexed or not; the values are also their
/// order in stored folders.
enum FileType : int32_t {
  FILE_TYPE_DOCUMENT = 0,  ///< documents, text, source code, archives, e-books, mail
  FILE_TYPE_AUDIO = 1,     ///< also playlists
  FILE_TYPE_VIDEO = 2,     ///< also disc images
  FILE_TYPE_IMAGE = 3,     ///< the kind "photo" of a folder
  FILE_TYPE_OTHER = 4,     ///< any extension that is not in the table
};

/// The share's name: the first component of a share path.
/// @throws Error kBadArgument when the path is empty or does not begin with "/".
FERROX_EXPORT void GetShareNameByPath(std::string& share_name, const std::string& share_path);
FERROX_EXPORT std::string GetShareNameByPath(const std::string& share_path);

/// The full path of a share path: what the share's own folder lies in, and the share path behind it. Nothing need be
/// there besides the share. Asks the platform each time. @throws Error kBadArgument as above; kNoSuchShare.
FERROX_EXPORT void GetFullPath(std::string& full_path, const std::string& share_path);
FERROX_EXPORT std::string GetFullPath(const std::string& share_path);

/// The share that a full path lies in, and its share path. Of shares that lie in each other the platform gives the
/// deepest. Takes the platform's mutex.
/// @throws Error kInternal "KOVAShareNamePathGet failed, full_path=...".
FERROX_EXPORT void GetShareNamePathByFullPath(std::string& share_name, std::string& share_path,
                                              const std::string& full_path);

/// `path`, share path or full path, with the first component named `old_share` renamed to `new_share`.
/// @throws Error kBadArgument "Cannot find share: <old>" when no component has that name.
FERROX_EXPORT std::string ReplacePathShare(const std::string& path, const std::string& new_share,
                                           const std::string& old_share);

/// The kind of a file by its extension, whatever its case; a name without one is a document. Goes by the text alone:
/// nothing need be there, and a folder's name counts likewise.
FERROX_EXPORT FileType GetFileTypeByFullPath(const std::string& path);

/// The query strings of the four kinds: "document", "audio", "video", "image" to extensions joined with " OR ".
FERROX_EXPORT const std::map<std::string, std::string>& GetCategoryQueries();

/// Whether the path lies in its share's recycle bin or in that of a home. @throws Error kInternal.
FERROX_EXPORT bool IsFullPathInRecycleBin(const std::string& full_path);

/// Whether the path may be indexed: no snapshot, remote or image file system, locked or read-only share, recycle bin,
/// foreign mount point, or path that is not canonical (a link anywhere, "..", doubled or trailing "/").
/// @throws Error kInternal when no share holds the path; kNoSuchShare.
FERROX_EXPORT bool CanFullPathBeIndexed(const std::string& full_path);
/// The same for a share path.
FERROX_EXPORT bool CanPathBeIndexed(const std::string& share_path);

/// Whether a file or folder of this name, given without its folder, belongs to a system and not to a user: what the
/// platform hides, and what other systems leave behind (".DS_Store"). Neither it nor anything below it is indexed.
FERROX_EXPORT bool IsSystemPreservedFileName(const std::string& file_name);

/// Fields of the kernel's memory report.
inline constexpr char kMemTotal[] = "MemTotal";
inline constexpr char kMemFree[] = "MemFree";
inline constexpr char kCached[] = "Cached";
inline constexpr char kSwapTotal[] = "SwapTotal";
inline constexpr char kSwapFree[] = "SwapFree";

/// Notify the administrators that the index volume is full, or that the system lacks memory, through the platform's
/// notifier; each waits until that program has ended. Failures are ignored.
FERROX_EXPORT void SendZEMNotify();
FERROX_EXPORT void NotifyLackOfMemory();

/// Appends an event of the library's own to the queue of the share that `path` (full) lies in: `event` is a set of the
/// EVENT_ bits, `path_old` the old full path of a rename, `data` the flags of a configuration change. Writes nothing
/// when a queued reindex already covers `path`. Blocks for the queue's lock, at most about 58 s.
/// @throws Error as its steps do (kInternal, kNoSuchShare, kLockFailed, kMalformedEvent); the share is then marked as
/// needing a reindex, so that the change is not lost.
FERROX_EXPORT void AddCustomEvent(int event, const std::string& path, const std::string& path_old,
                                  const Json::Value& data);

}  // namespace ferrox::fileindex
