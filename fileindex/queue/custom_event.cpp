#define FERROX_SOURCE "util"

#include "fileindex/queue/custom_event.h"

#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <exception>
#include <functional>

#include <json/value.h>

#include "base/path_table.h"
#include "common/log.h"
#include "common/new_class.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/queue/queue_line.h"
#include "fileindex/queue/queue_mgr.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"

namespace ferrox::fileindex {

namespace {

/// Says, given a queue, whether a reindex that waits in it covers the path of the event: it is carried out later than
/// what the event reports happened, so the event would add nothing.
using IsCovered = std::function<bool(const std::string& queue_path)>;

/// Appends the line unless a waiting reindex covers it. That is asked without the lock, which is held for the writing
/// alone; a reindex in the detached queue counts as waiting, also while it is carried out.
void QueueEvent(const std::string& queue_path, const std::string& path, const std::string& line,
                const IsCovered& is_covered) {
  if (is_covered(queue_path)) return;
  FERROX_FAIL_IF(line.size() - 1 > kQueueLineMaxBytes, Error::kInternal, "Event too long for a queue, path=" + path);
  const LockedQueue queue(queue_path);
  FERROX_FAIL_IF_AS(!queue.Append(line), "!AppendLines(queue_path, line)", Error::kInternal,
                    "Failed to write queue, reason=" + ErrnoText());
}

/// Queues the event; when that fails, the share is marked instead.
void QueueOrMark(const std::string& path, const std::string& line, const IsCovered& is_covered) {
  std::string share_name;
  std::string share_path;
  // Whatever fails, the change must reach the index: by the mark, the whole share is compared with the disk.
  try {
    GetShareNamePathByFullPath(share_name, share_path, path);
    QueueEvent(sdk::SDKShare(share_name).GetQueuePath(), path, line, is_covered);
  } catch (const Error& error) {
    Log(LOG_ERR, "%s:%d (%d, %u) (%s) AddCustomEvent failed, code=%d, reason=%s. Set [%s] need reindex%s",
        ModuleName(FERROX_SOURCE).c_str(), __LINE__, getpid(), geteuid(), "AddCustomEvent",
        static_cast<int>(error.Code()), error.what(), share_name.c_str(), ErrnoSuffix().c_str());
    errno = 0;
    newClass<StatusMgr>()->SetShareStatus(share_name, StatusMgr::kNeedReindex);
    throw;
  }
}

}  // namespace

/// The reindexes that a share's queues held when this was made, and those of the writer since. It answers as a search
/// of the queues would, but they are read once.
class QueuedReindexes {
 public:
  explicit QueuedReindexes(const std::string& queue_path) {
    try {
      (void)QueueMgr(queue_path).FindQueues([this](const std::shared_ptr<Event>& event) {
        if (event->event == EVENT_REINDEX) Add(event->path);
        return false;
      });
    } catch (const Error&) {
      failure_ = std::current_exception();
    }
  }

  void Add(const std::string& path) { paths_.Insert(path, true); }

  /// QueueMgr::IsFullPathHasReindex: what stands before a bad line is found, then the bad line fails.
  bool Cover(const std::string& full_path) const {
    const bool is_covered = paths_.HasAtOrAbove(full_path);
    if (!is_covered && failure_) std::rethrow_exception(failure_);
    return is_covered;
  }

 private:
  base::PathTable<bool> paths_;
  std::exception_ptr failure_;
};

void AddCustomEvent(int event, const std::string& path, const std::string& path_old, const Json::Value& data) {
  QueueOrMark(path, CustomEventLine(event, path, path_old, data),
              [&path](const std::string& queue_path) { return QueueMgr(queue_path).IsFullPathHasReindex(path); });
}

CustomEventWriter::CustomEventWriter() = default;
CustomEventWriter::~CustomEventWriter() = default;

void CustomEventWriter::Add(int event, const std::string& path, const std::string& path_old, const Json::Value& data) {
  QueuedReindexes* queued = nullptr;
  QueueOrMark(path, CustomEventLine(event, path, path_old, data), [&](const std::string& queue_path) {
    std::unique_ptr<QueuedReindexes>& known = queues_[queue_path];
    if (known == nullptr) known = std::make_unique<QueuedReindexes>(queue_path);
    queued = known.get();
    return queued->Cover(path);
  });
  if (event == EVENT_REINDEX) queued->Add(path);
}

}  // namespace ferrox::fileindex
