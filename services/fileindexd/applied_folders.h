#pragma once

#include <string>

#include "services/fileindexd/share_folders.h"

namespace ferrox::indexd {

/// The folders that a share's index was last brought in line with, kept in a file: where they differ from the present
/// ones, a change is still to be carried out, even when the event that should tell of it was lost with its sender.
/// Beside them the place where the share's volume was mounted then: where nothing is now, no file was deleted. A file
/// that is missing or unreadable means no folders, so that all are compared. Belongs to one thread.
class AppliedFolders {
 public:
  explicit AppliedFolders(const std::string& path);

  const ShareFolders& Get() const { return folders_; }
  /// "": none, or not known.
  const std::string& MountPoint() const { return mount_point_; }
  /// A file that cannot be written is logged; the folders are then compared again after a restart.
  void Set(const ShareFolders& folders, const std::string& mount_point);
  /// The index holds nothing.
  void Forget();

 private:
  std::string path_;
  ShareFolders folders_;
  std::string mount_point_;
};

}  // namespace ferrox::indexd
