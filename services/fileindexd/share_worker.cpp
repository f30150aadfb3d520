#include "services/fileindexd/share_worker.h"

#include <algorithm>

#include "common/error.h"
#include "fileindex/status_mgr.h"
#include "services/fileindexd/share_report.h"

namespace ferrox::indexd {

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

/// How long a worker that is to end waits for answers of other daemons to what it has asked already.
constexpr milliseconds kAnswerGrace(1000);

}  // namespace

ShareWorker::ShareWorker(const std::string& share, const WorkerEnvironment& environment)
    : context_(share, environment), keeper_(context_), loop_(context_, keeper_, inner_shares_) {}

void ShareWorker::Start() {
  thread_ = std::thread([this] {
    loop_.Run();
    end_.set_value();
  });
}

void ShareWorker::RequestStop() {
  if (context_.stopping.exchange(true)) return;
  stop_requested_at_ = steady_clock::now();
  context_.syncs.End("its indexing was just ended or begun anew; ask again");
  Wake();
}

bool ShareWorker::StopWithin(milliseconds patience) {
  RequestStop();
  if (!thread_.joinable()) return true;
  const auto end = steady_clock::now() + patience;
  if (ended_.wait_until(std::min(end, stop_requested_at_ + kAnswerGrace)) != std::future_status::ready) {
    context_.interruption.CutWaits();
    if (ended_.wait_until(end) != std::future_status::ready) return false;
  }
  thread_.join();
  return true;
}

void ShareWorker::Stop() {
  while (!StopWithin(std::chrono::hours(1))) {
  }
}

void ShareWorker::Forget() {
  Stop();
  context_.applied.Forget();
}

void ShareWorker::Wake() {
  if (context_.stopping || context_.environment.pause.Paused()) context_.interruption.Request();
  context_.watch.Wake();
}

void ShareWorker::SetInnerShares(const std::vector<std::string>& folders) {
  if (inner_shares_.Set(folders)) Wake();
}

void ShareWorker::CheckIndex() {
  keeper_.RequestCheck();
  Wake();
}

uint64_t ShareWorker::RequestSync() {
  if (IsUpToDate()) return 0;
  const uint64_t request = context_.syncs.Add();
  Wake();
  return request;
}

/// Asked in this order: what leaves the live queue is in the detached one until the index has it.
bool ShareWorker::IsUpToDate() const {
  if (!loop_.IsSettled() || keeper_.IsCheckRequested() || inner_shares_.HasUnseen() || context_.queue.HasLines() ||
      context_.queue.IsDetached()) {
    return false;
  }
  try {
    using fileindex::StatusMgr;
    return (StatusMgr().GetShareStatus(context_.share) & StatusMgr::kNeedReindex) == 0;
  } catch (const Error&) {
    return false;  // the worker meets the same failure and says why
  }
}

std::string ShareWorker::AwaitSync(uint64_t request, QueueProgress::TimePoint end) {
  std::string reason;
  switch (context_.syncs.Wait(request, end, reason)) {
    case QueueProgress::Result::kDone:
      return "";
    case QueueProgress::Result::kFailed:
      return "share " + context_.share + ": " + reason;
    case QueueProgress::Result::kTimeout:
      break;
  }
  return "share " + context_.share +
         ": its changes are still being indexed; give more time, 'fileindexctl status' shows how far it is";
}

Json::Value ShareWorker::Status(milliseconds engine_wait) {
  Json::Value json = ReportShare(context_);
  keeper_.AddNoteTo(json);
  json["index"] = keeper_.Figures(engine_wait);
  if (keeper_.ShowsUnknownRebuilding(json["index"])) CheckIndex();
  return json;
}

}  // namespace ferrox::indexd
