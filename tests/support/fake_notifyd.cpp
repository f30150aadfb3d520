#include <kova/notifyd.h>

#include "platform/shared/failure.h"
#include "platform/shared/monitor_document.h"
#include "tests/support/fake_platform.h"

using ferrox::test::FakeCallFails;
using ferrox::test::FakePlatform;

namespace KOVA::KOVANOTIFYD {

namespace {

std::string CallArguments(const std::string& queue_path, const std::string& application, int type) {
  return queue_path + ", " + application + ", " + std::to_string(type);
}

}  // namespace

bool MonitorQueue::Upsert(const MonitorQueue& queue, const std::string& application, int type) {
  std::vector<std::string> left_out;
  const Json::Value document = kova::WithoutTrailingSlashes(queue.Document(), left_out);
  const bool named = document.isObject() && document["queue"].isString();
  const std::string queue_path = named ? document["queue"].asString() : "";
  if (FakeCallFails("MonitorQueue::Upsert", CallArguments(queue_path, application, type))) return false;
  if (!kova::MonitorDocumentProblem(document).empty()) {
    (void)KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
    return false;
  }
  FakePlatform::Get().monitor_queues[{application, type, queue_path}] = document;
  return true;
}

bool MonitorQueue::Delete(const std::string& queue_path, const std::string& application, int type) {
  if (FakeCallFails("MonitorQueue::Delete", CallArguments(queue_path, application, type))) return false;
  (void)FakePlatform::Get().monitor_queues.erase({application, type, queue_path});
  return true;
}

}  // namespace KOVA::KOVANOTIFYD
