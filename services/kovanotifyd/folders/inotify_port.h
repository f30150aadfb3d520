#pragma once

#include <memory>
#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/folders/folder_port.h"

namespace ferrox::notifyd {

/// A watch of inotify for each folder.
class InotifyPort : public FolderPort {
 public:
  /// "" or why there is no inotify, without a full stop and with the remedy.
  std::string Open();

  const char* Name() const override { return "inotify"; }
  Limit WatchLimit() const override;
  int Fd() const override { return inotify_.Get(); }
  int Watch(int folder, Wanted wanted, FolderKey& key) override;
  std::string Reason(int error) const override;
  void Unwatch(FolderKey key, const std::string& path) override;
  bool UnwatchesByPath() const override { return false; }
  bool Read(std::vector<FolderRecord>& records) override;

 private:
  bool Fill();

  base::UniqueFd inotify_;
  std::unique_ptr<char[]> buffer_;
  size_t filled_ = 0;
};

}  // namespace ferrox::notifyd
