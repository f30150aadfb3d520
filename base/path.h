#pragma once

#include <string>
#include <string_view>

/// Paths as texts: nothing here looks at a file system. Paths are in their plain form: no "." or "..", no "/" at the
/// end except that of "/" itself.
namespace base {

/// Whether `path` is `folder` or lies below it, by whole names: "/v/ab" does not lie below "/v/a". All absolute paths
/// lie below "/", and below the empty path, which is how "/" looks where names are put behind it with a "/" before
/// each. What is empty lies below no folder but the empty one.
inline bool IsAtOrBelow(std::string_view path, std::string_view folder) {
  if (!path.starts_with(folder)) return false;
  return path.size() == folder.size() || path[folder.size()] == '/' || folder == "/";
}

/// The same without the folder itself: "/v/a/b" lies below "/v/a", "/v/a" does not.
inline bool IsBelow(std::string_view path, std::string_view folder) {
  return path.size() > folder.size() && IsAtOrBelow(path, folder);
}

/// What stands before the last "/", the whole path when there is none: empty for what lies in "/", as IsAtOrBelow takes
/// that folder. A part of `path`, valid as long as that is.
inline std::string_view ParentOf(std::string_view path) { return path.substr(0, path.rfind('/')); }

/// The folder that holds `path`: "/" for what lies in "/" (and for "/" itself), "." for a name without a folder. So the
/// result can always be opened as it is, unlike that of ParentOf.
inline std::string FolderOf(std::string_view path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string_view::npos) return ".";
  return std::string(path.substr(0, slash == 0 ? 1 : slash));
}

/// What stands behind the last "/", the whole path when there is none; empty for "/".
inline std::string NameOf(std::string_view path) { return std::string(path.substr(path.rfind('/') + 1)); }

}  // namespace base
