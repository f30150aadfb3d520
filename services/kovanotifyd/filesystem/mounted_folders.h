#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/filesystem/folder_locator.h"

namespace ferrox::notifyd {

/// Opens folders and files by their keys. That takes an open folder on a mount of their file system; since an open
/// descriptor would keep a volume from being unmounted, each mount is opened when it is needed and closed by Close.
class MountedFolders {
 public:
  explicit MountedFolders(FanGroup& group) : group_(group) {}

  /// Opens folders of the key's file system through the mount that `path` is on from now on; `folder` is that folder,
  /// open, and has that key. @return "", or why folders there cannot be opened by their keys.
  std::string Add(const std::string& path, int folder, const HandleKey& key);
  /// Drops all mounts of the key's file system.
  void Remove(const HandleKey& key);
  /// Closes all descriptors.
  void Close();

  /// As FolderSource::ReadPlace.
  FolderSource::Answer ReadPlace(const HandleKey& folder, FolderPlace& place);
  /// Whether the name is in the folder; nothing when the folder cannot be opened.
  std::optional<bool> HasName(const HandleKey& folder, std::string_view name);
  /// The number of what the name in the folder stands for; 0 when there is none.
  uint64_t NumberOf(const HandleKey& folder, std::string_view name);
  /// Opens the folder or file through the first mount of its file system that is still there. Not valid with errno set
  /// when that fails.
  base::UniqueFd Open(const HandleKey& folder, int flags);

 private:
  /// A mount: its highest folder that can be reached, and a key of its file system.
  struct Anchor {
    std::string path;
    HandleKey key;
    base::UniqueFd fd = {};  ///< until Close
  };

  bool IsOpen(Anchor& anchor);
  FolderSource::Answer ReadPlaceBy(int mount, const HandleKey& folder, FolderPlace& place);

  FanGroup& group_;
  std::vector<Anchor> anchors_;
};

}  // namespace ferrox::notifyd
