#pragma once

#include <functional>
#include <memory>
#include <string>
#include <utility>

#include "base/mutex.h"
#include "services/fileindexd/share_folders.h"

namespace ferrox::indexd {

/// Loads a share's folders from the configuration, and keeps what was loaded last for the status.
class CurrentFolders {
 public:
  /// The patterns for all folders, as they are set now. @throws Error kLoadFailed when that cannot be told.
  using InstancePatterns = std::function<ShareFolders::InstancePatterns()>;

  CurrentFolders(const std::string& share, const std::string& root, InstancePatterns patterns)
      : share_(share), root_(root), patterns_(std::move(patterns)) {}

  /// @throws Error as ShareFolders::Load.
  ShareFolders Load();
  /// Whether the configuration still says the same. False also when it cannot be read: then it may have changed.
  bool AreStill(const ShareFolders& folders);
  /// Those loaded last; null before the first Load. From any thread.
  std::shared_ptr<const ShareFolders> LastLoaded() const;

 private:
  const std::string share_;
  const std::string root_;
  const InstancePatterns patterns_;
  mutable base::Mutex mutex_;
  std::shared_ptr<const ShareFolders> last_ BASE_GUARDED_BY(mutex_);
};

}  // namespace ferrox::indexd
