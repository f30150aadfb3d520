#include "services/fileindexd/index_daemon.h"

#include <sys/resource.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <thread>

#include "base/scope_exit.h"
#include "common/error.h"
#include "common/json_util.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/status_mgr.h"
#include "services/support/json_command.h"
#include "services/support/settings_problem.h"

namespace ferrox::indexd {

namespace {

constexpr int kSyncTimeoutMs = 30 * 1000;
constexpr int kSyncTimeoutMaxMs = 600 * 1000;
constexpr char kStopping[] = "the index daemon is being stopped; start it with 'fileindexctl up'";

std::vector<std::string> FilesOf(const IndexDaemon::Options& options) {
  std::vector<std::string> files = options.share_files;
  files.push_back(InstancePath(kFileIndexFoldersCfgPath));
  files.push_back(InstancePath(kFileIndexExclusionsCfgPath));
  return files;
}

/// A walk holds one open folder for each level of the tree.
void AllowManyOpenFiles() {
  rlimit limit = {};
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
  limit.rlim_cur = std::min<rlim_t>(limit.rlim_max, 65536);
  (void)setrlimit(RLIMIT_NOFILE, &limit);
}

unsigned ThreadsFor(unsigned wanted) { return wanted != 0 ? wanted : std::thread::hardware_concurrency(); }

std::string ShareName(const Json::Value& data) {
  std::string share;
  GetJsonValue(share, data, "share_name", true);
  return share;
}

/// Absent or null: none.
std::vector<std::string> ShareNames(const Json::Value& data) {
  std::vector<std::string> names;
  const Json::Value& shares = data.isObject() ? data["shares"] : Json::Value::nullSingleton();
  bool usable = IsJsonArray(shares);
  for (Json::ArrayIndex i = 0; usable && i < shares.size(); ++i) {
    usable = shares[i].isString();
    if (usable) names.push_back(shares[i].asString());
  }
  if (!usable) throw Error(Error::kBadArgument, "shares is not an array of names");
  return names;
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
    {"sync", &IndexDaemon::OnSync},
    {"status", &IndexDaemon::OnStatus},
};

IndexDaemon::IndexDaemon(const Options& options)
    : pool_(ThreadsFor(options.workers)),
      workers_([this, options](const std::string& share) {
        WorkerEnvironment environment{pool_, pause_};
        environment.instance_patterns = options.instance_patterns;
        environment.is_mount_point = options.is_mount_point;
        environment.mounts_below = options.mounts_below;
        environment.describe_share = options.describe_share;
        return std::make_unique<ShareWorker>(share, environment);
      }),
      configuration_(FilesOf(options)),
      on_share_change_(options.on_share_change) {
  AllowManyOpenFiles();
}

IndexDaemon::~IndexDaemon() {
  stopping_ = true;
  configuration_.Wake();
  if (configuration_thread_.joinable()) configuration_thread_.join();
}

void IndexDaemon::Start() {
  try {
    pause_.Set(fileindex::StatusMgr().GetPauseInfo());
  } catch (const Error& error) {
    // Every worker meets the same unreadable file and says so in its status.
    Log(LOG_ERR, "the pause is unknown: %s", services::Describe(error).c_str());
  }
  Reconcile();
  configuration_thread_ = std::thread([this] { FollowConfiguration(); });
}

/// Not every operation that changes shares or folders sends a command.
void IndexDaemon::FollowConfiguration() {
  while (!stopping_) {
    const bool changed = configuration_.Wait(configuration_.LongestWait());
    if (stopping_) return;
    if (changed) on_share_change_();
    Reconcile();
    if (changed) workers_.WakeAll();  // the rules of a share that stays may have changed
    workers_.CheckIndices(SharesBeingRebuilt());
  }
}

void IndexDaemon::Reconcile() {
  try {
    workers_.Reconcile();
    registrations_.Reconcile();
  } catch (const Error& error) {
    Log(LOG_ERR, "the workers and watches stay as they are: %s", services::Describe(error).c_str());
  }
}

std::string IndexDaemon::Handle(const std::string& request, const services::Peer& peer) {
  const auto answer = [this](const std::string& type, const Json::Value& data) {
    for (const Command& command : kCommands) {
      if (type == command.type) return (this->*command.run)(data);
    }
    throw Error(Error::kBadArgument, "unknown command: " + type);
  };
  return services::AnswerJsonCommand(request, peer, answer, {"sync", "status"});
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
  workers_.WakeAll();
}

Json::Value IndexDaemon::OnWorkerCreate(const Json::Value& data) {
  workers_.Create(ShareName(data));
  return Json::Value();
}

Json::Value IndexDaemon::OnWorkerDelete(const Json::Value& data) {
  workers_.Delete(ShareName(data));
  return Json::Value();
}

Json::Value IndexDaemon::OnSettingChanged(const Json::Value& data) {
  workers_.SettingChanged(ShareName(data));
  return Json::Value();
}

Json::Value IndexDaemon::OnSync(const Json::Value& data) {
  int timeout_ms = kSyncTimeoutMs;
  GetJsonValue(timeout_ms, data, "timeout_ms", false);
  if (timeout_ms < 0 || timeout_ms > kSyncTimeoutMaxMs) {
    throw Error(Error::kBadArgument, "timeout_ms is not from 0 to " + std::to_string(kSyncTimeoutMaxMs));
  }
  const auto end = std::chrono::steady_clock::now() + std::chrono::milliseconds(timeout_ms);
  const base::ScopeExit count([this] { --syncs_; });
  if (++syncs_ > kSyncsMax) throw Error(Error::kInternal, "too many wait for their changes already; ask again");
  const std::string problems = syncs_ended_ ? kStopping : workers_.Sync(ShareNames(data), end);
  if (!problems.empty()) throw Error(Error::kInternal, problems);
  return Json::Value();
}

void IndexDaemon::EndSyncs() {
  syncs_ended_ = true;
  workers_.EndSyncs(kStopping);
}

Json::Value IndexDaemon::OnStatus(const Json::Value&) {
  Json::Value status;
  status["pid"] = getpid();
  status["resume_time"] = Json::Int64(pause_.ResumeTime());
  status["paused"] = pause_.Paused();
  status["workers"] = pool_.Threads();
  status["read"] = Json::UInt64(workers_.FilesRead());
  status["shares"] = workers_.Status();
  return status;
}

}  // namespace ferrox::indexd
