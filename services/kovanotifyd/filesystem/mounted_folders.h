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

/// Reaches folders by their keys, through the mounts that their file systems are seen by. A descriptor would keep a
/// volume from being unmounted: each mount is opened when it is needed, until Close.
class MountedFolders {
 public:
  explicit MountedFolders(FanGroup& group) : group_(group) {}

  /// From now on a file system is seen by the mount that `path`, an open folder with that key, is on.
  /// @return "", or why folders there cannot be reached by their keys.
  std::string Add(const std::string& path, int folder, const HandleKey& key);
  /// Forgets all mounts of the key's file system.
  void Remove(const HandleKey& key);
  /// Closes what is open.
  void Close();

  FolderSource::Answer ReadPlace(const HandleKey& folder, FolderPlace& place);
  /// Whether the name is in the folder; nothing when the folder cannot be opened.
  std::optional<bool> HasName(const HandleKey& folder, std::string_view name);
  /// The number of what the name in the folder stands for; 0 when there is none.
  uint64_t NumberOf(const HandleKey& folder, std::string_view name);
  /// Opens the folder or file by whichever mount of its file system is there.
  base::UniqueFd Open(const HandleKey& folder, int flags);

 private:
  struct Anchor {
    std::string path;
    HandleKey key;
    base::UniqueFd fd = {};
  };

  bool IsOpen(Anchor& anchor);
  FolderSource::Answer ReadPlaceBy(int mount, const HandleKey& folder, FolderPlace& place);

  FanGroup& group_;
  std::vector<Anchor> anchors_;
};

}  // namespace ferrox::notifyd
