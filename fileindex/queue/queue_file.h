#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "common/export.h"
#include "common/lock_file.h"

/// Which files belong to one share's queue, by the path of the live one: SDKShare::GetQueuePath(), or, of a share that
/// is gone, ComposeQueuePath. Their life: writers append to "<queue>"; the index daemon renames it to "<queue>.tmp",
/// works through that and removes it; beside them it keeps in "<queue>.folders" which folders its last pass applied.
namespace ferrox::fileindex {

/// "<queue>.tmp", the detached queue: it is read, and never written.
FERROX_EXPORT std::string DetachedQueuePath(const std::string& queue_path);
/// "<queue>.folders", the folders that the index was brought up to last.
FERROX_EXPORT std::string AppliedFoldersPath(const std::string& queue_path);
/// The live queue of the share whose absolute folder is, or was, `share_path`; "" when the platform cannot say. The
/// share need not exist.
FERROX_EXPORT std::string ComposeQueuePath(const std::string& share_path);

/// Removes all three files of a share that is no longer there: a later share in the same folder would take them for its
/// own. Missing files and failures do not matter.
FERROX_EXPORT void RemoveQueueFiles(const std::string& queue_path);

/// The live queue while lines are appended to it, under the lock that also the detaching takes: the file that is
/// appended to cannot be renamed away meanwhile. One thread holds it at a time, here and in other processes.
class FERROX_EXPORT LockedQueue {
 public:
  /// Makes the file when missing and blocks while its lock is held elsewhere, at most about 58 s.
  /// @throws Error kLockFailed as LockFile does.
  explicit LockedQueue(const std::string& queue_path);
  /// The same without waiting: null, with errno set, when the lock cannot be had at once; EWOULDBLOCK while it is held
  /// elsewhere.
  static std::unique_ptr<LockedQueue> Try(const std::string& queue_path);

  /// Appends whole lines by one write, all of them or none (AppendLines). False, with errno set, when that fails.
  bool Append(std::string_view lines) const;

 private:
  LockedQueue(const std::string& queue_path, std::unique_ptr<LockFile> lock);

  std::string queue_path_;
  std::unique_ptr<LockFile> lock_;
};

}  // namespace ferrox::fileindex
