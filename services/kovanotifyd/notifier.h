#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <future>
#include <mutex>
#include <set>
#include <string>
#include <vector>

#include "base/unique_fd.h"
#include "services/kovanotifyd/cookie.h"
#include "services/kovanotifyd/queues/queue_router.h"
#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/roots/watch_set.h"
#include "services/kovanotifyd/sync_rounds.h"

namespace ferrox::notifyd {

/// What people can see of one registration.
struct QueueStatus {
  struct Watch {
    std::string path;
    WatchState state;
  };

  std::string queue;
  std::string application;
  std::vector<Watch> watches;
  QueueFigures figures;
};

struct NotifierStatus {
  std::vector<QueueStatus> queues = {};
  uint64_t changes = 0;                    ///< reported by the kernel
  uint64_t lost = 0;                       ///< how many times it dropped some
  std::vector<std::string> problems = {};  ///< sentences
};

/// Carries what happens in the registered folders into the queues: the loop between registry, watchers and router.
class Notifier : private WatchSet::Listener {
 public:
  struct Options {
    std::string registry_folder;
    ReadRegistry read_registry;
    std::vector<Way> ways;        ///< the best first
    std::vector<Cookie> cookies;  ///< one a way: what its watcher was made with
    bool scans = true;
    std::chrono::seconds scan_interval{600};
    /// Folders and beginnings of file names that belong to this instance's daemons: nothing in there is a change.
    std::vector<std::string> own_paths = {};
    std::vector<std::string> problems = {};  ///< sentences that the status repeats
    QueueRouter::Options router = {};
    /// Events that come within so long are read together, which takes a quarter of the time that each alone takes.
    std::chrono::milliseconds batch{25};
  };

  explicit Notifier(Options options);
  ~Notifier() override;

  /// Works until `stop_fd` becomes readable, then appends what it has. Requests fail from then on.
  void Run(int stop_fd);

  /// Waits until every change that happened before the call is in the queues. Returns a sentence for each thing that
  /// keeps some out. From any thread.
  /// @throws Error kInternal, with a sentence, when that takes longer or the daemon is being stopped.
  std::vector<std::string> Sync(std::chrono::milliseconds timeout);
  /// From any thread. @throws Error kInternal when the daemon is being stopped.
  NotifierStatus Status();

 private:
  using TimePoint = std::chrono::steady_clock::time_point;
  using Task = std::function<void()>;

  void OnChange(Change change) override;
  void OnCompare(const std::string& path) override;
  void OnLost(size_t way) override;
  void OnCookie(size_t way) override;

  void Step(int stop_fd);
  TimePoint NextDue() const;
  void Wait(int stop_fd);
  void RunTasks();
  void DoWhatIsDue();
  void ReadRegistry();
  void AfterExamination();
  void ReadChanges();
  void BeginSync();
  void ContinueSync();
  std::string SyncState() const;
  NotifierStatus MakeStatus() const;
  bool IsOwn(const std::string& path) const;

  void Post(Task task);
  void Close();

  Options options_;
  RegistryWatch registry_watch_;
  Registry registry_;
  QueueRouter router_;
  WatchSet watches_;
  SyncRounds syncs_;
  std::vector<std::string> sync_problems_;  ///< of the round under way

  bool is_stopping_ = false;
  bool has_work_ = true;  ///< a watcher has something to go on with
  bool registry_changed_ = false;
  bool disturbed_ = false;
  TimePoint read_at_;
  TimePoint flush_at_;
  TimePoint examine_at_;
  TimePoint scan_at_;
  TimePoint expire_at_;
  std::set<std::string> logged_problems_;
  uint64_t changes_ = 0;
  uint64_t lost_ = 0;

  std::mutex mutex_;  ///< guards the two below
  std::vector<Task> tasks_;
  bool is_closed_ = false;
  base::UniqueFd wake_;
};

}  // namespace ferrox::notifyd
