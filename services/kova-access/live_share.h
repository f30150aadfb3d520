#pragma once

#include <sys/stat.h>

#include <string>

#include "base/unique_fd.h"
#include "wire/live_files.h"

namespace ferrox::access {

/// The descriptors of this process as a folder: the one way to open for reading, with every check, exactly what an
/// O_PATH descriptor refers to. Opened once, with the daemon's own rights; other threads use it with theirs.
class OwnDescriptors {
 public:
  /// @throws Error kInternal without /proc
  OwnDescriptors();
  /// Opens what `path_fd`, a descriptor with O_PATH, refers to, as open(2) does at the end of its path.
  base::UniqueFd Reopen(int path_fd, int flags) const;

 private:
  base::UniqueFd folder_;
};

/// A share's folder, and what is in it, for the user whose ids the calling thread has; to be used by that thread alone.
/// Nothing is opened but regular files and folders, and nothing that is reached by a link or lies on another mount.
/// Nothing is read, so no time of last access changes.
class LiveShare {
 public:
  /// Goes to the folder from "/" on. When the user cannot, nothing in the share is readable; that is no failure.
  LiveShare(const OwnDescriptors& own_descriptors, const std::string& root);

  /// @throws Error kEngineRightsUnknown when the kernel cannot open a file without following links (before Linux 5.6).
  wire::LiveFile Look(const std::string& path) const;
  /// None when the user may not read the file. Blocks while a lease on it is being broken.
  /// @throws as Look
  base::UniqueFd Open(const std::string& path) const;

 private:
  wire::LiveFile LookAtRoot() const;
  base::UniqueFd Find(const std::string& path, struct stat& status) const;

  const OwnDescriptors& own_descriptors_;
  std::string root_path_;
  base::UniqueFd root_;
};

}  // namespace ferrox::access
