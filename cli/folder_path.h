#pragma once

#include <string>

namespace ferrox::fileindex {
class FolderMgr;
}

/// How the paths that people give become the share paths and full paths that the library takes.
namespace ferrox::cli {

/// Whether anything is at a path, a dangling link too.
bool Exists(const std::string& path);

/// The share path ("/photo/trip") of the folder that a person means by `text`: a share path, or a path on disk, also
/// one from the working folder. Needless "/" and "." are dropped. A path of `configured` stands for itself, whatever
/// has become of its folder. Where a text can be read both ways, the way that exists counts, the share path first.
/// @throws Failure for a path on disk that no share holds.
std::string ToSharePath(const std::string& text, const fileindex::FolderMgr& configured);

/// Whether a text can be one name in a path: the name of a share, a user, a folder.
bool IsPathName(const std::string& text);

/// A path that begins with "/" itself, another one behind the working folder. Nothing is cleaned or looked up.
/// @throws Failure "the working folder cannot be told; give <what>".
std::string FromWorkingFolder(const std::string& text, const char* what);

/// An absolute path without needless "/" and ".", and without ".." when `parents` is set; nothing is looked up.
std::string CleanPath(const std::string& absolute, bool parents);
/// The same for a path that may begin in the working folder, ".." resolved.
std::string AbsolutePath(const std::string& text);

}  // namespace ferrox::cli
