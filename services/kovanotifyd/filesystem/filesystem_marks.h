#pragma once

#include <string>
#include <vector>

#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/filesystem/mounted_folders.h"

namespace ferrox::notifyd {

/// The marks of a group of fanotify: one on each file system that has a root, one on the folder of the cookie file, and
/// those by which the kernel leaves out what the daemons write into their own folders.
class FilesystemMarks {
 public:
  /// `quiet_folders`: the daemons' own.
  FilesystemMarks(FanGroup& group, MountedFolders& mounts, std::string cookie, std::vector<std::string> quiet_folders)
      : group_(group), mounts_(mounts), cookie_(std::move(cookie)), quiet_folders_(std::move(quiet_folders)) {}

  /// Opens the group and marks the cookie's folder, unless that is done. @return "", or why it fails.
  std::string Open();
  /// Marks the file system of a root, an open folder with that key, which is reached through the root's mount from then
  /// on. @return "", or why it fails.
  std::string Mark(const std::string& root, int folder, const HandleKey& key);
  /// Takes the mark away and forgets the mounts.
  void Release(const HandleKey& key);

  /// Whether the record tells that the cookie was touched.
  bool IsCookie(const FanRecord& record) const;
  /// The keys of the quiet folders that are there.
  std::vector<HandleKey> QuietFolders();
  /// Has the kernel leave out changes of names in a folder that lies in a quiet one, as long as it has that folder in
  /// memory. Does nothing for records of other kinds, and before Linux 6.0.
  void Ignore(const FanRecord& record);

 private:
  FanGroup& group_;
  MountedFolders& mounts_;
  const std::string cookie_;
  const std::vector<std::string> quiet_folders_;
  HandleKey cookie_folder_;
  std::string cookie_name_;
  bool can_ignore_ = true;
};

}  // namespace ferrox::notifyd
