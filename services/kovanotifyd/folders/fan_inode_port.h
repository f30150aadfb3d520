#pragma once

#include <map>
#include <string>
#include <vector>

#include "services/kovanotifyd/fan_group.h"
#include "services/kovanotifyd/folders/folder_port.h"

namespace ferrox::notifyd {

/// Watches folders by marks of fanotify on their inodes, which needs no privileges, but Linux 5.17 and file systems
/// with file handles. A folder's key is a hash of its handle. The kernel joins changes of one name in one record.
class FanInodePort : public FolderPort {
 public:
  /// `group` is open and has no marks.
  explicit FanInodePort(FanGroup group) : group_(std::move(group)) {}

  // As in FolderPort:
  const char* Name() const override { return "fanotify inode marks"; }
  Limit WatchLimit() const override;
  int Fd() const override { return group_.Fd(); }
  int Watch(int folder, Wanted wanted, FolderKey& key) override;
  std::string Reason(int error) const override;
  void Unwatch(FolderKey key, const std::string& path) override;
  /// A mark can only be taken from a folder that is open, and opening one by its key takes privileges.
  bool UnwatchesByPath() const override { return true; }
  bool Read(std::vector<FolderRecord>& records) override;

 private:
  void LearnNumbers(int folder, const HandleKey& handle);

  FanGroup group_;
  /// Where handles have the file's inode number, by FanGroup::FormOf; as few entries as there are kinds of file
  /// systems.
  std::map<std::string, FanGroup::NumberPlace> number_places_;
  FanBatch batch_;  ///< of the last Read; the names in its records point into it
};

}  // namespace ferrox::notifyd
