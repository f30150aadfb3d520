#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <vector>

#include "services/kovanotifyd/cookie.h"
#include "services/kovanotifyd/queues/queue_router.h"
#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/roots/watch_set.h"
#include "services/kovanotifyd/status.h"
#include "services/kovanotifyd/sync_rounds.h"
#include "services/kovanotifyd/task_queue.h"

namespace ferrox::notifyd {

/// The daemon's loop, which carries what happens in the registered folders into the queues: the registry says what to
/// watch, the WatchSet's watchers report changes (OnChange), the QueueRouter appends them to the queues. All of it
/// belongs to the thread of Run; Sync and Status hand their requests to that thread and wait.
///
/// A turn of the loop waits for something to do, then runs requests, reads the registry if it changed, reads the
/// watchers' changes once a batch has gathered, lets the watchers go on with what takes time, examines the roots if one
/// was disturbed, and appends what is due. Each part is bounded in time, so that none keeps the others waiting.
class Notifier : private WatchSet::Listener {
 public:
  struct Options {
    std::string registry_folder;
    ReadRegistry read_registry;
    std::vector<Way> ways;        ///< the best first
    std::vector<Cookie> cookies;  ///< one for each way: the one that its watcher was made with
    bool scans = true;            ///< whether roots that no watcher takes are compared at intervals
    std::chrono::seconds scan_interval{600};
    /// Beginnings of the paths of this instance's own files: folders with a trailing "/", and parts of file names.
    /// Changes of these are dropped.
    std::vector<std::string> own_paths = {};
    std::vector<std::string> problems = {};  ///< sentences, for the status
    QueueRouter::Options router = {};
    /// How long changes gather after the first one before they are read: together they take a quarter of the time that
    /// they take one by one.
    std::chrono::milliseconds batch{25};
  };

  explicit Notifier(Options options);
  ~Notifier() override;

  /// Works until `stop_fd` becomes readable, then appends what waits. Requests fail from then on.
  void Run(int stop_fd);

  /// Waits until every change that happened before the call is in the queues. Returns a sentence for each thing that
  /// keeps some of them out. From any thread except that of Run.
  /// @throws Error kInternal, with a sentence, when that takes longer or the daemon is being stopped.
  std::vector<std::string> Sync(std::chrono::milliseconds timeout);
  /// From any thread except that of Run. @throws Error kInternal when the daemon is busy or being stopped.
  NotifierStatus Status();

 private:
  using TimePoint = std::chrono::steady_clock::time_point;

  /// When the loop has something to do; TimePoint::max(): not before something else happens.
  struct DueTimes {
    TimePoint read = TimePoint::max();    ///< the watchers' changes
    TimePoint flush = TimePoint::max();   ///< the router's lines
    TimePoint examine;                    ///< registry and folders
    TimePoint scan;                       ///< the roots that no watcher takes
    TimePoint expire = TimePoint::max();  ///< the sync requests
  };

  // From the WatchSet: what goes on to the router and to the syncs.
  void OnChange(Change change) override;
  void OnCompare(const std::string& path) override;
  void OnLost(size_t way) override;
  void OnCookie(size_t way) override;

  void Step(int stop_fd);
  TimePoint NextDue() const;
  void Wait(int stop_fd);
  void RunDue();
  void ReadRegistry();
  void ScheduleExamination();
  void ReadChanges();
  void BeginSync();
  void ContinueSync();
  std::string SyncState() const;
  NotifierStatus MakeStatus() const;
  void Post(TaskQueue::Task task);
  void Close();

  Options options_;
  RegistryReader registry_;
  QueueRouter router_;
  WatchSet watches_;
  SyncRounds syncs_;
  TaskQueue tasks_;
  DueTimes due_;

  bool is_stopping_ = false;
  bool has_work_ = true;           ///< a watcher has something to go on with
  bool registry_changed_ = false;  ///< its folder reported a change
  bool disturbed_ = false;         ///< a descriptor of WatchSet::Disturbances reported something
  uint64_t changes_ = 0;           ///< as in NotifierStatus
  uint64_t lost_ = 0;
};

}  // namespace ferrox::notifyd
