#include "services/fileindexd/watch_registrations.h"

#include <syslog.h>

#include <utility>

#include <kova/notifyd.h>

#include "common/error.h"
#include "common/log.h"
#include "fileindex/operations/watch_list.h"
#include "sdk/share.h"

namespace ferrox::indexd {

namespace {

using KOVA::KOVANOTIFYD::MONITOR_QUEUE_TYPE_APPLICATION;
using KOVA::KOVANOTIFYD::MonitorQueue;

/// The queue of a share of which everything was registered; "" when it is not to be had now.
std::string Register(const std::string& share, const fileindex::FolderMgr& folder_mgr) try {
  const std::string queue_path = sdk::SDKShare(share).GetQueuePath();
  const MonitorQueue queue(fileindex::WatchListOf(share, queue_path, folder_mgr));
  FERROX_FAIL_IF(!MonitorQueue::Upsert(queue, fileindex::kAppName, MONITOR_QUEUE_TYPE_APPLICATION), Error::kInternal,
                 "the notification daemon's registry does not take it");
  return queue_path;
} catch (const Error& error) {
  Log(LOG_WARNING, "share %s: its folders are not registered to be watched: %s", share.c_str(), error.what());
  return "";
}

}  // namespace

void WatchRegistrations::Reconcile() {
  const fileindex::FolderMgr folder_mgr;
  std::map<std::string, std::string> now;
  for (const std::string& share : folder_mgr.GetIndexedShares()) {
    const std::string queue_path = Register(share, folder_mgr);
    const auto before = queue_of_share_.find(share);
    if (!queue_path.empty()) {
      now[share] = queue_path;
    } else if (before != queue_of_share_.end()) {
      now.insert(*before);
    }
  }
  for (const auto& [share, queue_path] : queue_of_share_) {
    const auto registered = now.find(share);
    if (registered != now.end() && registered->second == queue_path) continue;
    (void)MonitorQueue::Delete(queue_path, fileindex::kAppName, MONITOR_QUEUE_TYPE_APPLICATION);
  }
  queue_of_share_ = std::move(now);
}

}  // namespace ferrox::indexd
