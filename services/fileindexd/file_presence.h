#pragma once

#include <limits.h>
#include <sys/stat.h>

#include <string>

namespace ferrox::indexd {

enum class Presence {
  kThere,    ///< a file or folder
  kGone,     ///< nothing, or a symbolic link, which the index does not hold
  kUnknown,  ///< the system cannot say; errno tells why
};

/// What is at `path` for the index. `status` is lstat's, also of a link.
Presence PresenceOf(const std::string& path, struct stat& status);

/// Whether no call of the system can take the path. Nothing is ever indexed there; walks leave it out.
inline bool IsTooLong(const std::string& path) { return path.size() >= PATH_MAX; }

}  // namespace ferrox::indexd
