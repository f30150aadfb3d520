#pragma once

#include <atomic>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include <json/value.h>

#include "services/fileindexd/file_watch.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/share_worker.h"
#include "services/fileindexd/task_pool.h"
#include "services/fileindexd/watch_registrations.h"
#include "services/fileindexd/worker_set.h"
#include "services/support/frame_server.h"

namespace ferrox::indexd {

/// The daemon without its socket: keeps the workers of the shares in step with folders and shares, in a thread of its
/// own, and answers the commands that steer them (docs/formats/daemon.md). The road of one event begins here:
///   WorkerSet makes a ShareWorker for each share -> its WorkerLoop does a ShareRound -> QueuePass detaches the queue
///   -> OperationRunner takes its operations through MoveStage and DiskStage -> DocumentWriter -> ShareIndex.
class IndexDaemon {
 public:
  /// How many "sync" requests may wait at once: each holds a request thread, and the other commands need some.
  static constexpr unsigned kSyncsMax = 24;
  static constexpr unsigned kRequestThreads = kSyncsMax + 4;

  struct Options {
    /// The patterns of what is left out of all folders (CurrentFolders).
    CurrentFolders::InstancePatterns instance_patterns = [] { return ShareFolders::InstancePatterns(); };
    /// Threads that read files, for all shares together; 0: one for each processor.
    unsigned workers = 0;
    /// Files that change when shares do; without them that is noticed at intervals.
    std::vector<std::string> share_files = {};
    /// Called when one of these has changed, before the shares are looked at.
    std::function<void()> on_share_change = [] {};
    IsMountPoint is_mount_point = &NothingMounted;
    MountsBelow mounts_below = &NoMounts;
    DescribeShare describe_share = [](const std::string&) { return std::nullopt; };
  };

  explicit IndexDaemon(const Options& options);
  IndexDaemon(const IndexDaemon&) = delete;
  IndexDaemon& operator=(const IndexDaemon&) = delete;
  /// Stops all work where it is.
  ~IndexDaemon();

  /// Takes the pause from the status file and makes the workers.
  void Start();

  /// Answers one request; never throws. Safe from several threads.
  std::string Handle(const std::string& request, const services::Peer& peer);
  /// Ends the requests that wait for shares, and those to come. From any thread.
  void EndSyncs();

 private:
  struct Command;
  static const Command kCommands[];

  Json::Value OnPause(const Json::Value& data);
  Json::Value OnResume(const Json::Value& data);
  Json::Value OnWorkerCreate(const Json::Value& data);
  Json::Value OnWorkerDelete(const Json::Value& data);
  Json::Value OnSettingChanged(const Json::Value& data);
  Json::Value OnSync(const Json::Value& data);
  Json::Value OnStatus(const Json::Value& data);

  void SetPause(int64_t resume_time);
  void FollowConfiguration();
  void Reconcile();

  InterruptibleClock clock_;
  TaskPool pool_;
  PauseState pause_;
  WorkerSet workers_;
  WatchRegistrations registrations_;
  FileWatch configuration_;
  const std::function<void()> on_share_change_;
  std::atomic<unsigned> syncs_{0};
  std::atomic<bool> syncs_ended_{false};
  std::atomic<bool> stopping_{false};
  std::thread configuration_thread_;
};

}  // namespace ferrox::indexd
