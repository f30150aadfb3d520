#pragma once

#include <string>
#include <thread>

#include "services/fileindexd/interruption.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_status.h"
#include "services/support/exclusions.h"

namespace ferrox::indexd {

/// Counts the files below a folder that are indexed, in a thread of its own while it lives, and reports the count to
/// the status as the comparison's estimate. It only reads names and stays on the folder's device, so that it is far
/// ahead of the comparison; the rules that need a look at each file are left out.
class FileCount {
 public:
  /// All but `folder` outlive it.
  FileCount(const std::string& folder, const ShareFolders& folders, services::Exclusions& exclusions,
            ShareStatus& status);
  FileCount(const FileCount&) = delete;
  FileCount& operator=(const FileCount&) = delete;
  ~FileCount();

 private:
  void Count(const std::string& folder);

  const ShareFolders& folders_;
  services::Exclusions& exclusions_;
  ShareStatus& status_;
  Interruption stop_;
  std::thread thread_;
};

}  // namespace ferrox::indexd
