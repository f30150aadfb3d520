#define FERROX_SOURCE "util"

#include "fileindex/custom_event.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
#include <optional>

#include <json/value.h>

#include "common/json_util.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "common/new_class.h"
#include "common/unique_fd.h"
#include "fileindex/optree.h"
#include "fileindex/path_table.h"
#include "fileindex/queue_mgr.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

namespace {

std::string EventLine(int event, const std::string& path, const std::string& path_old, const Json::Value& data) {
  Json::Value line(Json::objectValue);
  line["event"] = event;
  line["path"] = path;
  line["path_old"] = path_old;
  line["data"] = data;
  return toString(line) + "\n";
}

/// Whether the file's last line lacks its end: a writer died in it, and the next line must not be glued to it.
bool EndsInHalfLine(int fd, off_t size) {
  char last = '\n';
  return size > 0 && pread(fd, &last, 1, size - 1) == 1 && last != '\n';
}

/// Takes back what a failed write left, unless somebody else has written behind it.
void TakeBack(int fd, off_t size_before, ssize_t written) {
  struct stat now = {};
  if (written <= 0 || fstat(fd, &now) != 0 || now.st_size != size_before + written) return;
  if (ftruncate(fd, size_before) != 0) Log(LOG_ERR, "cannot take back half a queue line: %m");
}

/// Appends the line to the queue, whose lock the caller holds, with one write: it is there whole or not at all.
void AppendLine(const std::string& queue_path, std::string line) {
  const UniqueFd queue(open(queue_path.c_str(), O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC | O_NOFOLLOW, 0644));
  struct stat before = {};
  FERROX_FAIL_IF(!queue.Valid() || fstat(queue.Get(), &before) != 0, Error::kInternal,
                 "Failed to open queue, reason=" + ErrnoText());
  if (EndsInHalfLine(queue.Get(), before.st_size)) line.insert(0, "\n");
  errno = 0;
  const ssize_t written = write(queue.Get(), line.data(), line.size());
  if (written == static_cast<ssize_t>(line.size())) return;
  const int write_errno = errno != 0 ? errno : ENOSPC;
  TakeBack(queue.Get(), before.st_size, written);
  errno = write_errno;
  FERROX_FAIL_IF_AS(true, "written != line.size()", Error::kInternal, "Failed to write queue, reason=" + ErrnoText());
}

/// Says, given a queue, whether a reindex that waits in it will see whatever the event would tell.
using IsCovered = std::function<bool(const std::string& queue_path)>;

void QueueEvent(const std::string& queue_path, const std::string& path, const std::string& line,
                const IsCovered& is_covered) {
  if (is_covered(queue_path)) return;
  FERROX_FAIL_IF(line.size() - 1 > kQueueLineMaxBytes, Error::kInternal, "Event too long for a queue, path=" + path);
  const LockFile lock(queue_path, true);
  AppendLine(queue_path, line);
}

/// Queues the event; when that fails, the share is marked instead.
void QueueOrMark(const std::string& path, const std::string& line, const IsCovered& is_covered) {
  std::string share_name;
  std::string share_path;
  try {
    GetShareNamePathByFullPath(share_name, share_path, path);
    QueueEvent(sdk::SDKShare(share_name).GetQueuePath(), path, line, is_covered);
  } catch (const Error& error) {
    Log(LOG_ERR, "%s:%d (%d, %u) (%s) AddCustomEvent failed, code=%d, reason=%s. Set [%s] need reindex%s",
        ModuleName(FERROX_SOURCE).c_str(), __LINE__, getpid(), geteuid(), "AddCustomEvent",
        static_cast<int>(error.Code()), error.what(), share_name.c_str(), ErrnoSuffix().c_str());
    errno = 0;
    newClass<StatusMgr>()->SetShareStatus(share_name, StatusMgr::kNeedReindex);
    throw Error(error);
  }
}

}  // namespace

/// The reindexes that a share's queues held when this was made, and those of the writer since.
class QueuedReindexes {
 public:
  explicit QueuedReindexes(const std::string& queue_path) {
    try {
      (void)QueueMgr(queue_path).FindQueues([this](const std::shared_ptr<Event>& event) {
        if (event->event == EVENT_REINDEX) Add(event->path);
        return false;
      });
    } catch (const Error& error) {
      failure_ = error;
    }
  }

  void Add(const std::string& path) { paths_.Insert(path, true); }

  /// QueueMgr::IsFullPathHasReindex: what stands before a bad line is found, then the bad line fails.
  bool Cover(const std::string& full_path) const {
    bool is_covered = false;
    paths_.VisitUpwards(full_path, [&is_covered](bool) { return is_covered = true; });
    if (!is_covered && failure_) throw Error(*failure_);
    return is_covered;
  }

 private:
  PathTable<bool> paths_;
  std::optional<Error> failure_;
};

void AddCustomEvent(int event, const std::string& path, const std::string& path_old, const Json::Value& data) {
  QueueOrMark(path, EventLine(event, path, path_old, data),
              [&path](const std::string& queue_path) { return QueueMgr(queue_path).IsFullPathHasReindex(path); });
}

CustomEventWriter::CustomEventWriter() = default;
CustomEventWriter::~CustomEventWriter() = default;

void CustomEventWriter::Add(int event, const std::string& path, const std::string& path_old, const Json::Value& data) {
  QueuedReindexes* queued = nullptr;
  QueueOrMark(path, EventLine(event, path, path_old, data), [&](const std::string& queue_path) {
    std::unique_ptr<QueuedReindexes>& known = queues_[queue_path];
    if (known == nullptr) known = std::make_unique<QueuedReindexes>(queue_path);
    queued = known.get();
    return queued->Cover(path);
  });
  if (event == EVENT_REINDEX) queued->Add(path);
}

}  // namespace ferrox::fileindex
