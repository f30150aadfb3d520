#pragma once

#include <memory>
#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/folders/folder_port.h"

namespace ferrox::notifyd {

/// Watches folders by inotify. Its records name both sides of a move in two halves, which are put together here.
class InotifyPort : public FolderPort {
 public:
  /// @return "", or why inotify is not available, with the remedy and without a full stop.
  std::string Open();

  // As in FolderPort:
  const char* Name() const override { return "inotify"; }
  Limit WatchLimit() const override;
  int Fd() const override { return inotify_.Get(); }
  /// The key is the watch descriptor, which the kernel gives again only after 2^31 others.
  int Watch(int folder, Wanted wanted, FolderKey& key) override;
  std::string Reason(int error) const override;
  void Unwatch(FolderKey key, const std::string& path) override;
  bool UnwatchesByPath() const override { return false; }
  /// Waits up to 30 ms for the second half of a move. Its records have no inode numbers.
  bool Read(std::vector<FolderRecord>& records) override;

 private:
  bool Fill();

  base::UniqueFd inotify_;
  std::unique_ptr<char[]> buffer_;  ///< the names in the records of the last Read point into it
  size_t filled_ = 0;               ///< bytes of it
};

}  // namespace ferrox::notifyd
