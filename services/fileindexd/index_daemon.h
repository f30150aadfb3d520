#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>

#include <json/value.h>

#include "services/fileindexd/share_worker.h"
#include "services/support/frame_server.h"

namespace ferrox::indexd {

/// The workers of all shares and the commands that steer them (docs/formats/daemon.md).
class IndexDaemon {
 public:
  struct Options {
    /// Threads that read files, for all shares together; 0: one a processor.
    unsigned workers = 0;
  };

  explicit IndexDaemon(const Options& options);
  IndexDaemon(const IndexDaemon&) = delete;
  IndexDaemon& operator=(const IndexDaemon&) = delete;
  /// Stops all work where it is.
  ~IndexDaemon();

  /// Takes the pause from the status file and makes a worker for each share.
  void Start();

  /// Answers one request; never throws. Safe from several threads.
  std::string Handle(const std::string& request, const services::Peer& peer);

 private:
  struct Command;
  static const Command kCommands[];

  Json::Value OnPause(const Json::Value& data);
  Json::Value OnResume(const Json::Value& data);
  Json::Value OnWorkerCreate(const Json::Value& data);
  Json::Value OnWorkerDelete(const Json::Value& data);
  Json::Value OnSettingChanged(const Json::Value& data);
  Json::Value OnStatus(const Json::Value& data);

  Json::Value Dispatch(const std::string& request, const services::Peer& peer);
  void SetPause(int64_t resume_time);
  void CreateWorker(const std::string& share);

  InterruptibleClock clock_;
  TaskPool pool_;
  PauseState pause_;
  std::mutex mutex_;  ///< guards the map; held while workers are made and stopped, so that commands keep their order
  std::map<std::string, std::unique_ptr<ShareWorker>> workers_;
};

}  // namespace ferrox::indexd
