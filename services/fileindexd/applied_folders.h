#pragma once

#include <string>

#include "services/fileindexd/share_folders.h"

namespace ferrox::indexd {

/// The folders that a share's index was last brought in line with, kept in the file "<queue>.folders"
/// (docs/formats/daemon.md). Where they differ from the present ones, a change is still to be carried out, even when
/// the event of it was lost with its sender. Beside them stands where the share's volume was mounted then: when nothing
/// is mounted there now, missing files were not deleted. A file that is missing or unreadable means no folders, so that
/// all are compared. Belongs to one thread.
class AppliedFolders {
 public:
  explicit AppliedFolders(const std::string& path);

  const ShareFolders& Get() const { return folders_; }
  /// Where the share's volume was mounted; "" for the root file system, or when that is not known.
  const std::string& MountPoint() const { return mount_point_; }
  /// Replaces the file when something differs. A failure to write it is logged; the folders are then compared again
  /// after a restart.
  void Set(const ShareFolders& folders, const std::string& mount_point);
  /// Removes the file: the index is empty, or the share is not indexed here any more.
  void Forget();

 private:
  std::string path_;
  ShareFolders folders_;
  std::string mount_point_;
};

}  // namespace ferrox::indexd
