#include "services/fileindexd/current_folders.h"

#include "common/error.h"

namespace ferrox::indexd {

ShareFolders CurrentFolders::Load() {
  ShareFolders folders = ShareFolders::Load(share_, root_, patterns_());
  const base::MutexLock lock(mutex_);
  last_ = std::make_shared<const ShareFolders>(folders);
  return folders;
}

bool CurrentFolders::AreStill(const ShareFolders& folders) {
  try {
    return Load() == folders;
  } catch (const Error&) {
    return false;
  }
}

std::shared_ptr<const ShareFolders> CurrentFolders::LastLoaded() const {
  const base::MutexLock lock(mutex_);
  return last_;
}

}  // namespace ferrox::indexd
