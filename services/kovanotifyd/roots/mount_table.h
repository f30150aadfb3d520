#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "base/unique_fd.h"

namespace ferrox::notifyd {

/// A mount, as it was when it was looked up.
struct Mount {
  uint64_t id = 0;
  std::string entry = {};              ///< what names it in the table beside its id, which may be given to another one
  std::vector<uint64_t> beneath = {};  ///< the mounts that it lies on, nearest first
};

/// The mounts that this process sees.
class MountTable {
 public:
  explicit MountTable(const char* path = "/proc/self/mountinfo");

  /// Has something to tell (POLLPRI) after a mount or an unmount; -1 where that cannot be seen.
  int Fd() const { return fd_.Get(); }
  void Read();
  /// Where something was mounted or unmounted, as far as the Reads since the last call have seen it.
  std::set<std::string> TakeChanged() { return std::exchange(changed_, {}); }

  /// Without an entry when there is none of that id.
  Mount Find(uint64_t id) const;
  bool IsMounted(const Mount& mount) const;
  /// The id of the mount that a real path is on, as far as the table tells: nothing is looked at but that.
  uint64_t MountOf(const std::string& path) const;
  bool IsMountedAt(const std::string& point) const;
  /// Whether the mount's server may be away, so that a look at a path there may not come back.
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
  Lines lines_;
  std::set<std::string> changed_;
};

}  // namespace ferrox::notifyd
