#pragma once

#include <dirent.h>

#include <string>
#include <string_view>

#include "common/export.h"

struct KOVAFileCopyOptions;

/// Paths and files. Nothing here throws unless it says so: failure is false or an empty text.
namespace ferrox {

/// Whether `path` is a regular file. A symbolic link is not, even to one.
FERROX_EXPORT bool IsFileExist(const std::string& path);

/// Whether `path` is a directory or, with `follow`, a symbolic link to one.
/// Deliberate: a link's relative target is taken from the working directory, not from the link's folder.
FERROX_EXPORT bool IsDirExist(const std::string& path, bool follow);

/// Whether the directory entry, found at `path`, is a directory, by its type alone.
/// Deliberate: an entry of unknown type counts as none, whatever lstat would say.
FERROX_EXPORT bool IsDirentDir(const dirent& entry, const std::string& path);

/// Whether the calling user has any of the permissions `perm` (KOVA_PERM_*) on `path`.
FERROX_EXPORT bool CheckACLPerm(const std::string& path, int perm);

FERROX_EXPORT bool IsMountPoint(const std::string& path);

/// Whether `text` begins with `prefix`; an empty prefix always matches.
FERROX_EXPORT bool StringStartWith(const std::string& text, const std::string& prefix);

/// The text after the last "/", the whole text when there is none, "" when the path ends in one.
FERROX_EXPORT std::string Basename(const std::string& path);

/// The text before the last "/". Deliberate: the whole text when there is none, and "" for "/a".
FERROX_EXPORT std::string Dirname(const std::string& path);

/// The text after the last "." of the base name, "" when it has none; in lower case when `lower` is set.
FERROX_EXPORT std::string GetFileExtension(const std::string& path, bool lower);

/// The path without links, "." and ".."; "" when it cannot be resolved.
FERROX_EXPORT std::string RealPath(const std::string& path);

/// Removes a file; true when it is gone afterwards, also when it was missing before.
FERROX_EXPORT bool Unlink(const std::string& path);

/// A-Z to a-z, whatever the locale; any other byte stays.
inline char ToLowerAscii(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

/// The platform's copy of a file; true on success.
FERROX_EXPORT bool MVFileImpl(const std::string& src, const std::string& dst, const KOVAFileCopyOptions& options,
                              int flag);
/// Move or copy a file through the platform; true on success.
FERROX_EXPORT bool MVFile(const std::string& src, const std::string& dst);
FERROX_EXPORT bool CPFile(const std::string& src, const std::string& dst);

/// Hands `path` to the package's user "Ferrox"; whether that succeeded. Holds the SDK mutex for the look-up.
/// @throws Error kChownFailed when there is no such user.
FERROX_EXPORT bool ChownFerrox(const std::string& path);

/// Replaces the whole content of `path`, so that a crash at any moment leaves the old or the new content: a file beside
/// it is written, synced and renamed over it, and the folder synced. Mode and owner are those of the old file (the
/// owner as far as the caller may), else 0644 and the caller. Callers exclude each other: all writers of a path share
/// the file beside it. False, with errno set, when anything fails; the old content is then in place, unless it was only
/// the folder that could not be synced.
FERROX_EXPORT bool WriteWholeFile(const std::string& path, std::string_view content);

/// Makes the names in `folder` durable; false, with errno set, when that fails.
FERROX_EXPORT bool SyncFolder(const std::string& folder);

/// Reads the whole content of a regular file; false, with errno set, when it cannot be read.
FERROX_EXPORT bool ReadWholeFile(const std::string& path, std::string& content);

}  // namespace ferrox
