#include "fileindex/queue/queue_file.h"

#include <climits>
#include <utility>

#include <kova/file_index.h>

#include "common/file_util.h"
#include "common/line_file.h"
#include "common/mutex.h"
#include "common/sdk_mutex.h"

namespace ferrox::fileindex {

std::string DetachedQueuePath(const std::string& queue_path) { return queue_path + ".tmp"; }

std::string AppliedFoldersPath(const std::string& queue_path) { return queue_path + ".folders"; }

/// Under the process's mutex of the platform's share calls, which must not run at the same time.
std::string ComposeQueuePath(const std::string& share_path) {
  const LockMutex guard(sdk::SDKMutex());
  char path[PATH_MAX] = {};
  return 0 > FILEIDXQueuePathCompose(share_path.c_str(), path, sizeof(path)) ? std::string() : path;
}

void RemoveQueueFiles(const std::string& queue_path) {
  for (const std::string& path : {queue_path, DetachedQueuePath(queue_path), AppliedFoldersPath(queue_path)}) {
    (void)Unlink(path);
  }
}

LockedQueue::LockedQueue(const std::string& queue_path)
    : LockedQueue(queue_path, std::make_unique<LockFile>(queue_path, true)) {}

LockedQueue::LockedQueue(const std::string& queue_path, std::unique_ptr<LockFile> lock)
    : queue_path_(queue_path), lock_(std::move(lock)) {}

std::unique_ptr<LockedQueue> LockedQueue::Try(const std::string& queue_path) {
  std::unique_ptr<LockFile> lock = LockFile::Try(queue_path, true);
  if (lock == nullptr) return nullptr;
  return std::unique_ptr<LockedQueue>(new LockedQueue(queue_path, std::move(lock)));
}

/// By the path and not by the lock's descriptor, which is open for reading alone; while the lock is held, both are one
/// file.
bool LockedQueue::Append(std::string_view lines) const { return AppendLines(queue_path_, lines); }

}  // namespace ferrox::fileindex
