#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <future>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include <json/value.h>

#include "base/mutex.h"
#include "common/error.h"
#include "services/fileindexd/applied_folders.h"
#include "services/fileindexd/file_watch.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/queue_progress.h"
#include "services/fileindexd/share_folders.h"
#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_place.h"
#include "services/fileindexd/share_status.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::fileindex {
class QueueMgr;
}  // namespace ferrox::fileindex

namespace ferrox::indexd {

class OperationRunner;

/// The pause as all workers see it: seconds since the epoch at which it ends, 0 for a pause without end, -1 for none.
class PauseState {
 public:
  void Set(int64_t resume_time) { resume_time_ = resume_time; }
  int64_t ResumeTime() const { return resume_time_; }
  bool Paused() const;
  /// How long it still lasts, at most an hour.
  std::chrono::milliseconds Left() const;

 private:
  std::atomic<int64_t> resume_time_{-1};
};

/// Keeps the index of one share in step with its queue, in a thread of its own.
class ShareWorker {
 public:
  struct Environment {
    TaskPool& pool;
    const PauseState& pause;
    /// The index of a share.
    std::function<std::unique_ptr<ShareIndex>(const std::string& share)> open_index = &EngineShareIndex;
    /// From the end of a pass to the beginning of the next: changes seldom come alone.
    std::chrono::milliseconds gather_time{100};
    /// A pass that takes longer looks so often for files that change meanwhile.
    std::chrono::milliseconds keep_up_interval{200};
    /// While an operation goes on, an index may be missing or paused for a moment, or the event that tells of a rename.
    /// What takes longer than this was not finished.
    std::chrono::milliseconds patience = std::chrono::seconds(5);
    IsMountPoint is_mount_point = &NothingMounted;
    MountsBelow mounts_below = &NoMounts;
    /// A volume that is away is looked for so often.
    std::chrono::milliseconds volume_poll = std::chrono::seconds(2);
  };

  /// @throws Error kNoSuchShare; kInternal.
  ShareWorker(const std::string& share, const Environment& environment);
  ShareWorker(const ShareWorker&) = delete;
  ShareWorker& operator=(const ShareWorker&) = delete;
  ~ShareWorker() { Stop(); }

  /// Begins to work in a thread.
  void Start();
  /// Asks the work to end where it is, for good; the queue stays as it is and is taken up again by the next worker.
  void RequestStop();
  /// The same, and waits for that. What another daemon does not answer soon is given up. Like Start, for one thread at
  /// a time. @return whether the thread has ended; it may hang where no daemon does, in a file system.
  bool StopWithin(std::chrono::milliseconds patience);
  /// The same, however long it takes.
  void Stop();
  bool IsStopping() const { return stopping_; }
  /// Stops, and keeps nothing: the share is not indexed any more.
  void Forget();
  /// Looks again at the pause, the queue and the share's settings at once.
  void Wake();

  /// Which indexed shares lie in this one now; what changes in that is carried out at once. From any thread, one at a
  /// time.
  void SetInnerShares(const std::vector<std::string>& folders);
  /// Looks whether the engine has made the index anew, and fills it then. From any thread.
  void CheckIndex();

  /// Asks that all that is queued now be in the index soon. @return what AwaitSync waits for; 0 when nothing is to be
  /// done. Like AwaitSync, from any thread.
  uint64_t RequestSync();
  /// Waits until it is, at most until `end`. @return "", or a sentence that names share, reason and remedy.
  std::string AwaitSync(uint64_t request, QueueProgress::TimePoint end);
  /// Ends all waiting in AwaitSync, because the daemon stops.
  void EndSyncs(const std::string& reason) { progress_.End(reason); }

  /// The share's folder when the worker was made; once it is another, this worker is of no use any more.
  const std::string& Root() const { return root_; }

  /// Carries out what is queued now, if anything. @throws Interrupted; Error when it is to be tried again.
  void RunOnce();

  /// How many files have been read for their content.
  uint64_t FilesRead() const { return status_.FilesRead(); }
  static constexpr std::chrono::milliseconds kEngineWait{2000};
  /// Waits for the engine's figures at most for so long.
  Json::Value Status(std::chrono::milliseconds engine_wait = kEngineWait);

 private:
  void Loop();
  bool NothingWaits() const;
  void Gather();
  void Tell(ShareStatus::State state, const std::string& detail);
  /// One round of the loop: works, and tells how long to wait for the next.
  std::chrono::milliseconds Round();
  std::chrono::milliseconds OnFailure(const Error& error);
  std::chrono::milliseconds OnNoSpace(const Error& error);
  std::chrono::milliseconds OnIndexPaused();
  bool HasFailedTooLong(int code) const;
  std::chrono::milliseconds NextDelay(std::chrono::milliseconds first, std::chrono::milliseconds last);

  void CheckShare();
  void EnsureIndex();
  void MakeMissingIndex();
  void FollowRebuilding();
  void FinishRebuilding();
  bool AwaitsEvent();
  void QueueNeededReindex();
  bool HoldsStrays();
  bool Queue(int event, const std::string& path);
  void AwaitFreeQueue();
  void RunPass();
  void RunOperations(fileindex::QueueMgr& queue, OperationRunner& runner, const ShareFolders& folders,
                     bool whole_share);
  ShareFolders LoadFolders();
  std::shared_ptr<const ShareFolders> Shown();
  std::vector<std::string> MountsLeftOut() const;
  Json::Value LeftOut(const ShareFolders& folders) const;
  void AwaitOtherFolders(const ShareFolders& folders);
  bool AreStill(const ShareFolders& folders);
  void QueueAgainIfChanged(const OperationRunner& runner, const ShareFolders& folders);

  std::string share_;
  std::string root_;
  std::string queue_path_;
  Environment environment_;
  std::unique_ptr<ShareIndex> index_;
  bool index_exists_ = false;
  std::atomic<bool> look_at_index_{true};
  std::atomic<int64_t> rebuilding_{0};  ///< the one that is under way, as ShareIndex tells it
  bool strays_looked_for_ = false;
  AppliedFolders applied_;
  std::optional<std::chrono::steady_clock::time_point> awaits_since_;
  std::set<std::string> written_ahead_;
  base::Mutex shown_mutex_;
  std::shared_ptr<const ShareFolders> shown_ BASE_GUARDED_BY(shown_mutex_);  ///< those last loaded, for the status
  std::optional<std::vector<std::string>> noted_inner_;                      ///< SetInnerShares's own
  std::atomic<uint64_t> inner_changes_{0};
  std::atomic<uint64_t> inner_changes_seen_{0};  ///< when the present or last round began
  int last_failure_ = 0;
  std::chrono::steady_clock::time_point failing_since_;  ///< with that failure
  std::chrono::steady_clock::time_point last_pass_end_;
  std::chrono::milliseconds delay_{0};  ///< grows while the same failure comes again
  bool told_no_space_ = false;
  bool away_ = false;  ///< the share's folder, or its volume, was not there
  ShareStatus status_;
  FileWatch watch_;
  Interruption interruption_;
  QueueProgress progress_;
  uint64_t serves_ = 0;               ///< the requests that the present round serves
  std::atomic<bool> settled_{false};  ///< the index was in line with folders and queue when the last round ended
  std::atomic<bool> stopping_{false};
  std::chrono::steady_clock::time_point stop_requested_;
  std::promise<void> end_;
  std::future<void> ended_ = end_.get_future();  ///< once the thread has
  std::thread thread_;
};

}  // namespace ferrox::indexd
