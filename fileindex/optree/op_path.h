#pragma once

#include <string_view>

namespace ferrox::fileindex {

/// Whether `path` is `folder` or lies below it; "/v/s/ab" does not lie below "/v/s/a".
inline bool IsAtOrBelow(std::string_view path, std::string_view folder) {
  return path.substr(0, folder.size()) == folder && (path.size() == folder.size() || path[folder.size()] == '/');
}

}  // namespace ferrox::fileindex
