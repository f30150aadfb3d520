#include "services/fileindexd/file_presence.h"

#include <cerrno>

namespace ferrox::indexd {

Presence PresenceOf(const std::string& path, struct stat& status) {
  if (lstat(path.c_str(), &status) == 0) return S_ISLNK(status.st_mode) ? Presence::kGone : Presence::kThere;
  return errno == ENOENT || errno == ENOTDIR || errno == ELOOP ? Presence::kGone : Presence::kUnknown;
}

}  // namespace ferrox::indexd
