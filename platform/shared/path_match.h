#pragma once

#include <string>

namespace kova {

/// Whether `path` is `folder` or lies below it, on whole components.
inline bool IsAtOrBelow(const std::string& path, const std::string& folder) {
  if (path.compare(0, folder.size(), folder) != 0) return false;
  return path.size() == folder.size() || path[folder.size()] == '/' || folder == "/";
}

}  // namespace kova
