#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// A mount as it was at one time.
struct Mount {
  uint64_t id = 0;                     ///< reused by the kernel for later mounts
  std::string entry = {};              ///< device, root and mount point in the table: tells mounts with one id apart
  std::vector<uint64_t> beneath = {};  ///< the ids of the mounts that it is mounted on, nearest first
};

/// The mounts that this process sees, as they were at the last Read. Asks nothing but the kernel's table, so that no
/// file system can block the caller.
class MountTable {
 public:
  explicit MountTable(const char* path = "/proc/self/mountinfo");

  /// Polls as POLLPRI after a mount or an unmount; -1 where that cannot be noticed.
  int Fd() const { return fd_.Get(); }
  /// Reads the table anew.
  void Read();
  /// The mount points where the Reads since the last call found something mounted or unmounted.
  std::set<std::string> TakeChanged() { return std::exchange(changed_, {}); }

  /// The mount of that id; without an entry when there is none.
  Mount Find(uint64_t id) const;
  bool IsMounted(const Mount& mount) const;
  /// Whether the mount is gone and the folder on the mount `id`, which it was mounted on, is visible again.
  bool IsUncovered(const Mount& mount, uint64_t id) const;
  /// The id of the mount that a path without links is on, by the mount points; 0 when the table has none.
  uint64_t MountOf(const std::string& path) const;
  bool IsMountedAt(const std::string& point) const;
  /// Whether the mount's files are on another machine, which may be away and not answer.
  bool IsNetwork(uint64_t id) const;

 private:
  struct Line {
    uint64_t parent = 0;
    std::string entry;
    std::string point;
    bool is_network = false;
  };
  using Lines = std::map<uint64_t, Line>;

  void NoteMissing(const Lines& lines, const Lines& others);

  std::string path_;
  base::UniqueFd fd_;
  Lines lines_;                    ///< by id
  std::set<std::string> changed_;  ///< for TakeChanged
};

}  // namespace ferrox::notifyd
