#include "services/fileindexd/index_daemon.h"

#include <sys/resource.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <thread>

#include "common/error.h"
#include "common/json_util.h"
#include "common/log.h"
#include "fileindex/status_mgr.h"
#include "sdk/share.h"

namespace ferrox::indexd {

namespace {

/// A walk holds one open folder a level.
void AllowManyOpenFiles() {
  rlimit limit = {};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = std::min<rlim_t>(limit.rlim_max, 65536);
  (void)setrlimit(RLIMIT_NOFILE, &limit);
}

unsigned ThreadsFor(unsigned wanted) { return wanted != 0 ? wanted : std::thread::hardware_concurrency(); }

Json::Value ErrorReply(int code, const std::string& message) {
  Json::Value reply;
  reply["success"] = false;
  reply["error"]["code"] = code;
  reply["error"]["msg"] = message;
  return reply;
}

}  // namespace

struct IndexDaemon::Command {
  const char* type;
  Json::Value (IndexDaemon::*run)(const Json::Value& data);
};

constexpr IndexDaemon::Command IndexDaemon::kCommands[] = {
    {"pause", &IndexDaemon::OnPause},
    {"resume", &IndexDaemon::OnResume},
    {"worker_create", &IndexDaemon::OnWorkerCreate},
    {"worker_delete", &IndexDaemon::OnWorkerDelete},
    {"notify_setting_changed", &IndexDaemon::OnSettingChanged},
    {"status", &IndexDaemon::OnStatus},
};

IndexDaemon::IndexDaemon(const Options& options) : pool_(ThreadsFor(options.workers)) { AllowManyOpenFiles(); }

IndexDaemon::~IndexDaemon() = default;

void IndexDaemon::Start() {
  try {
    pause_.Set(fileindex::StatusMgr().GetPauseInfo());
  } catch (const Error& error) {
    // Every worker meets the same unreadable file and says so in its status.
    Log(LOG_ERR, "the pause is unknown: %s", error.what());
  }
  const std::lock_guard lock(mutex_);
  for (const std::string& share : sdk::SDKShare::Enum()) CreateWorker(share);
}

std::string IndexDaemon::Handle(const std::string& request, const services::Peer& peer) {
  try {
    Json::Value reply;
    reply["data"] = Dispatch(request, peer);
    reply["success"] = true;
    return toString(reply);
  } catch (const Error& error) {
    return toString(ErrorReply(error.Code(), error.what()));
  } catch (const std::exception& error) {
    return toString(ErrorReply(Error::kInternal, error.what()));
  }
}

/// A request is a JSON text with or without the terminating zero that the library sends.
Json::Value IndexDaemon::Dispatch(const std::string& request, const services::Peer& peer) {
  FERROX_FAIL_IF(peer.uid != 0 && peer.uid != geteuid(), Error::kEngineNotPermitted,
                 "only root and the owner of this instance may steer it");
  const size_t end = request.find_last_not_of('\0');
  Json::Value json;
  const bool parsed = fromString(json, request.substr(0, end == std::string::npos ? 0 : end + 1)) && json.isObject();
  FERROX_FAIL_IF(!parsed, Error::kBadArgument, "the request is not a JSON object");
  std::string type;
  GetJsonValue(type, json, "type", true);
  for (const Command& command : kCommands) {
    if (type == command.type) return (this->*command.run)(json["data"]);
  }
  throw Error(Error::kBadArgument, "unknown command: " + type);
}

Json::Value IndexDaemon::OnPause(const Json::Value& data) {
  long long resume_time = 0;
  GetJsonValue(resume_time, data, "resume_time", true);
  SetPause(resume_time);
  return Json::Value();
}

Json::Value IndexDaemon::OnResume(const Json::Value&) {
  SetPause(-1);
  return Json::Value();
}

void IndexDaemon::SetPause(int64_t resume_time) {
  pause_.Set(resume_time);
  const std::lock_guard lock(mutex_);
  for (const auto& [share, worker] : workers_) worker->Wake();
}

/// A worker that exists is made anew, since the share may have moved.
Json::Value IndexDaemon::OnWorkerCreate(const Json::Value& data) {
  std::string share;
  GetJsonValue(share, data, "share_name", true);
  const std::lock_guard lock(mutex_);
  CreateWorker(share);
  return Json::Value();
}

Json::Value IndexDaemon::OnWorkerDelete(const Json::Value& data) {
  std::string share;
  GetJsonValue(share, data, "share_name", true);
  const std::lock_guard lock(mutex_);
  workers_.erase(share);
  return Json::Value();
}

/// The share's worker looks at its share again; one that is missing or no longer has a share is made or removed.
Json::Value IndexDaemon::OnSettingChanged(const Json::Value& data) {
  std::string share;
  GetJsonValue(share, data, "share_name", true);
  const std::vector<std::string> shares = sdk::SDKShare::Enum();
  const bool exists = std::find(shares.begin(), shares.end(), share) != shares.end();
  const std::lock_guard lock(mutex_);
  const auto known = workers_.find(share);
  if (!exists) {
    workers_.erase(share);
  } else if (known != workers_.end()) {
    known->second->Wake();
  } else {
    CreateWorker(share);
  }
  return Json::Value();
}

Json::Value IndexDaemon::OnStatus(const Json::Value&) {
  Json::Value status;
  status["pid"] = getpid();
  status["resume_time"] = Json::Int64(pause_.ResumeTime());
  status["paused"] = pause_.Paused();
  status["workers"] = pool_.Threads();
  status["shares"] = Json::Value(Json::arrayValue);
  const std::lock_guard lock(mutex_);
  for (const auto& [share, worker] : workers_) status["shares"].append(worker->Status());
  return status;
}

void IndexDaemon::CreateWorker(const std::string& share) {
  workers_.erase(share);
  auto worker = std::make_unique<ShareWorker>(share, ShareWorker::Environment{pool_, pause_});
  worker->Start();
  workers_[share] = std::move(worker);
}

}  // namespace ferrox::indexd
