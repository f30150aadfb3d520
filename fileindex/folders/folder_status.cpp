#define FERROX_SOURCE "folder"

#include "fileindex/folders/folder_status.h"

#include <cassert>
#include <exception>

#include "base/path_table.h"
#include "common/clock.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"
#include "fileindex/folders/folder.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_mgr.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"

namespace ferrox::fileindex {

/// QueueMgr::IsFullPathProcessing for many paths at once: the queues are read once, and no further than until an event
/// touched each of them. A bad line fails only those that nothing before it touched.
class QueueScan {
 public:
  QueueScan(const std::string& queue_path, const std::vector<std::string>& full_paths) {
    for (const std::string& path : full_paths) marks_.Insert(path, marks_.Size());
    is_touched_.resize(marks_.Size());
    untouched_ = marks_.Size();
    const auto touches_last = [this](const std::shared_ptr<Event>& event) {
      Touch(event->path);
      Touch(event->path_old);
      return untouched_ == 0;
    };
    try {
      (void)QueueMgr(queue_path).FindQueues(touches_last);
    } catch (const Error&) {
      failure_ = std::current_exception();
    }
  }

  /// @throws Error as IsFullPathProcessing does.
  bool IsProcessing(const std::string& full_path) const {
    const size_t* mark = marks_.Find(full_path);
    assert(mark != nullptr);
    if (is_touched_[*mark]) return true;
    if (failure_) std::rethrow_exception(failure_);
    return false;
  }

 private:
  void Touch(const std::string& path) {
    marks_.VisitUpwards(path, [this](size_t mark) {
      if (!is_touched_[mark]) --untouched_;
      is_touched_[mark] = true;
      return false;
    });
  }

  base::PathTable<size_t> marks_;
  std::vector<bool> is_touched_;
  size_t untouched_ = 0;
  std::exception_ptr failure_;
};

namespace {

/// Of a folder that something in the queue waits for.
const char* ProgressText(const StatusMgr& status_mgr) {
  const long long resume_time = status_mgr.GetPauseInfo();
  // A deadline that has passed, or none (-1), is no pause.
  return resume_time != 0 && Clock::Get().Now() >= resume_time ? "processing" : "paused";
}

}  // namespace

FolderStatus::FolderStatus(const std::vector<std::shared_ptr<Folder>>& folders) {
  for (const auto& folder : folders) Add(*folder);
}

FolderStatus::FolderStatus(const Folder& folder) { Add(folder); }

FolderStatus::~FolderStatus() = default;

void FolderStatus::Add(const Folder& folder) {
  // A path without a share fails when it is asked for.
  if (StringStartWith(folder.GetPath(), "/")) shares_[folder.GetShare()].folders.push_back(&folder);
}

sdk::SDKShare& FolderStatus::Open(Share& share, const std::string& name) {
  return share.record.Get([&name] { return std::make_unique<sdk::SDKShare>(name); });
}

bool FolderStatus::IsIndexing(Share& share, const Folder& folder) {
  const QueueScan& scan = share.scan.Get([this, &share, &folder] {
    const sdk::SDKShare& record = Open(share, folder.GetShare());
    const std::string queue_path = record.GetQueuePath();
    std::vector<std::string> full_paths;
    for (const Folder* one : share.folders) full_paths.push_back(one->FullPathBelow(Dirname(record.GetPath())));
    (void)folder_mgr_.Get([] { return std::make_unique<FolderMgr>(); });
    return std::make_unique<QueueScan>(queue_path, full_paths);
  });
  return scan.IsProcessing(folder.GetFullPath());
}

void FolderStatus::GetStatus(Json::Value& out, const Folder& folder) {
  const StatusMgr& status_mgr = status_mgr_.Get([] { return std::make_unique<StatusMgr>(); });
  const std::string name = folder.GetShare();
  Share& share = shares_[name];
  if (!CanFullPathBeIndexed(Dirname(Open(share, name).GetPath()) + folder.GetPath())) {
    out["text"] = "error";
    out["desc"] = "invalid_path";
  } else if ((status_mgr.GetShareStatus(name) & StatusMgr::kNeedReindex) != 0) {
    out["text"] = "need_reindex";
  } else {
    out["text"] = IsIndexing(share, folder) ? ProgressText(status_mgr) : "finished";
  }
}

Json::Value FolderStatus::GetDataWithAdditional(const Folder& folder, const Json::Value& additionals) {
  FERROX_FAIL_IF_AS(!IsJsonArray(additionals), "!addiitionals.isArray()", Error::kBadArgument, toString(additionals));
  Json::Value data = folder.GetData();
  for (const Json::Value& it : additionals) {
    FERROX_FAIL_IF(!it.isString(), Error::kBadArgument, toString(it));
    if (it.asString() != "status") throw Error(Error::kBadArgument, "Unknown additioal: " + it.asString());
    GetStatus(data["additional"]["status"], folder);
  }
  return data;
}

}  // namespace ferrox::fileindex
