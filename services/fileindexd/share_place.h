#pragma once

#include <sys/stat.h>

#include <functional>
#include <string>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::indexd {

/// Whether something is mounted on a folder: 1, 0, or below 0 when the system cannot say.
using IsMountPoint = std::function<int(const std::string& path)>;

/// Where something is mounted below a folder, in ascending order.
using MountsBelow = std::function<std::vector<std::string>(const std::string& folder)>;

/// The same for a host that has no such question.
inline int NothingMounted(const std::string&) { return 0; }
inline std::vector<std::string> NoMounts(const std::string&) { return {}; }

/// Where the nearest mount at or above a folder is; "" for the root file system.
std::string MountPointOf(const std::string& folder, const IsMountPoint& is_mount_point);

/// Why what lies at `root`, the share's folder, is not what the index was made from, which lay in the mount at
/// `mount_point` ("": none): the folder is missing, or it is the empty place of a volume that is not mounted. "" when
/// nothing speaks against it; a folder with content is where the share is now, mounted or not.
std::string AbsenceOf(const std::string& root, const std::string& mount_point, const IsMountPoint& is_mount_point);

/// Holds an open descriptor of the folder at a path while it lives: its volume cannot be unmounted meanwhile but by
/// force, and IsStillThere finds out whether the path still leads to the same folder.
class HeldFolder {
 public:
  /// `path` outlives it. A folder that cannot be opened is not there.
  explicit HeldFolder(const std::string& path);
  bool IsStillThere() const;
  /// @throws Error kPathNotIndexable when it does not: what was not found there may be anywhere.
  void CheckStillThere() const;

 private:
  const std::string& path_;
  base::UniqueFd fd_;
};

}  // namespace ferrox::indexd
