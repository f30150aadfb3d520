#include "services/fileindexd/share_queue.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <chrono>

#include <json/value.h>

#include "base/unique_fd.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/lock_file.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/util.h"

namespace ferrox::indexd {

namespace {

uint64_t CountLinesOf(const std::string& path) {
  const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  struct stat status = {};
  if (!file.Valid() || fstat(file.Get(), &status) != 0 || status.st_size == 0) return 0;
  std::string begin(size_t{1} << 20, '\0');
  const ssize_t size = read(file.Get(), begin.data(), begin.size());
  if (size <= 0) return 0;
  const auto lines = static_cast<double>(std::count(begin.begin(), begin.begin() + size, '\n'));
  return static_cast<uint64_t>(lines * static_cast<double>(status.st_size) / static_cast<double>(size));
}

/// When the file was made, which is when its first line was written; 0 without a file that holds anything.
int64_t MadeAt(const std::string& path) {
  struct statx status = {};
  if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, STATX_BTIME | STATX_MTIME | STATX_SIZE, &status) != 0 ||
      status.stx_size == 0) {
    return 0;
  }
  return (status.stx_mask & STATX_BTIME) != 0 ? status.stx_btime.tv_sec : status.stx_mtime.tv_sec;
}

}  // namespace

ShareQueue::ShareQueue(const std::string& path) : path_(path), detached_path_(fileindex::DetachedQueuePath(path)) {}

bool ShareQueue::HasLines() const {
  struct stat status = {};
  return lstat(path_.c_str(), &status) == 0 && S_ISREG(status.st_mode) && status.st_size > 0;
}

bool ShareQueue::IsDetached() const { return IsFileExist(detached_path_); }
uint64_t ShareQueue::CountLines() const { return CountLinesOf(path_); }
uint64_t ShareQueue::CountDetachedLines() const { return CountLinesOf(detached_path_); }

int64_t ShareQueue::OldestChange() const {
  const int64_t detached = MadeAt(detached_path_);
  const int64_t live = MadeAt(path_);
  return detached == 0 || live == 0 ? detached + live : std::min(detached, live);
}

bool ShareQueue::Add(int event, const std::string& path) const {
  try {
    fileindex::AddCustomEvent(event, path, "", Json::Value());
    return true;
  } catch (const Error& error) {
    if (error.Code() != Error::kMalformedEvent && error.Code() != Error::kBadArgument) throw;
    return false;
  }
}

void ShareQueue::AwaitWriter(const Interruption& interruption) const {
  constexpr int kAttempts = 200;
  for (int i = 0; i < kAttempts && HasLines(); ++i) {
    if (LockFile::Try(path_, true) != nullptr || errno != EWOULDBLOCK) return;
    interruption.SleepFor(std::chrono::milliseconds(1));
  }
}

}  // namespace ferrox::indexd
