#pragma once

#include <string_view>

/// Questions about paths as texts: nothing here looks at a file system. Paths are absolute and in their plain form: no
/// "." or "..", no "/" at the end except that of "/" itself.
namespace base {

/// Whether `path` is `folder` or lies below it, by whole names: "/v/ab" does not lie below "/v/a". All paths lie below
/// "/", and below the empty path, by which a folder is meant whose name is "" before the first "/".
inline bool IsAtOrBelow(std::string_view path, std::string_view folder) {
  if (!path.starts_with(folder)) return false;
  return path.size() == folder.size() || path[folder.size()] == '/' || folder == "/";
}

/// The same without the folder itself.
inline bool IsBelow(std::string_view path, std::string_view folder) {
  return path.size() > folder.size() && IsAtOrBelow(path, folder);
}

}  // namespace base
