#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "base/unique_fd.h"

/// What a user may open on the disk now, asked of `kova-access` (docs/formats/access.md), which tries it with the ids
/// of that user. An index may be behind the disk; what is shown to a user is checked here before.
///
/// A user is a uid and all of its groups, in any order. A uid of 0, a uid or gid of 2^32 - 1, and a user without a
/// group are refused. Paths are full paths at or below the folder of their share. One with ".." in it, with a link on
/// its way below the share's folder, or of anything but a regular file or a folder is not readable.
namespace ferrox::wire {

/// The most paths, and the most bytes of paths, that go with one request; LookAs sends as many requests as it needs.
inline constexpr size_t kLookMaxPaths = 1000;
inline constexpr size_t kLookMaxBytes = 1U << 20;

struct LiveFile {
  bool readable = false;  ///< open(O_RDONLY) succeeds for the user
  bool folder = false;
  /// Only of the share's folder itself: the user may go into it, by every folder from "/" on. It can be true where
  /// `readable` is not. Where it is false, the user can open nothing in the share.
  bool entered = false;
  /// "SIZE.MTIME_NS.CTIME_NS.INODE" of what was opened; "" where neither `readable` nor `entered` is true.
  std::string stamp;
};

/// What the user may open: an element for each path, in the order of `paths`. Blocks at most `longest` for each wait,
/// of which there are few; the disk may be slow.
/// @throws Error kEngineRightsUnknown, with a sentence, when it cannot be told; nothing may then be shown.
std::vector<LiveFile> LookAs(uint32_t uid, const std::vector<uint32_t>& groups, const std::string& share_root,
                             const std::vector<std::string>& paths, std::chrono::milliseconds longest);

/// Opens one file or folder for reading as the user. @return the descriptor, close-on-exec; none where the user may not
/// @throws as LookAs
base::UniqueFd OpenAs(uint32_t uid, const std::vector<uint32_t>& groups, const std::string& share_root,
                      const std::string& path, std::chrono::milliseconds longest);

}  // namespace ferrox::wire
