#include "cli/share_remains.h"

#include <kova/notifyd.h>

#include "cli/ask.h"
#include "common/error.h"
#include "common/log.h"
#include "fileindex/elastic/elastic_control.h"
#include "fileindex/operations/watch_list.h"
#include "fileindex/queue/queue_file.h"
#include "wire/engine_requests.h"

namespace ferrox::cli {

std::string QueueOf(const std::string& share_path) {
  std::string path = fileindex::ComposeQueuePath(share_path);
  FERROX_FAIL_IF_AS(path.empty(), "0 > FILEIDXQueuePathCompose(share_path.c_str(), path, sizeof(path))",
                    Error::kInternal, "FILEIDXQueuePathCompose failed, share_path=" + share_path,
                    Subject{Subject::kQueuePlace, share_path});
  return path;
}

/// From the engine's list, which also has indices that are paused.
bool HasIndex(const std::string& share) {
  const std::string id = fileindex::elastic::GetFileIndexID(share);
  for (const Json::Value& index : AskEngine(wire::ListIndicesRequest(true))) {
    if (index["id"].asString() == id) return true;
  }
  return false;
}

void Unregister(const std::string& queue_path) {
  using namespace KOVA::KOVANOTIFYD;
  const bool done = MonitorQueue::Delete(queue_path, fileindex::kAppName, MONITOR_QUEUE_TYPE_APPLICATION);
  FERROX_FAIL_IF(!done, Error::kInternal, "the watch list of " + queue_path + " cannot be taken back");
}

/// The worker goes first, since it would make a dropped index anew.
void DropRemains(const std::string& share, const std::string& queue_path) {
  (void)AskIndexDaemonIfRunning("worker_delete", ShareName(share));
  try {
    fileindex::elastic::ShareIndexDelete(share);
  } catch (const Error& error) {
    if (error.Code() != Error::kEngineNoSuchIndex) throw;
  }
  fileindex::RemoveQueueFiles(queue_path);
}

}  // namespace ferrox::cli
