#pragma once

#include <atomic>
#include <chrono>
#include <deque>
#include <exception>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <thread>

#include "base/mutex.h"
#include "services/kovaelasticd/indices/index_upgrade.h"
#include "services/kovaelasticd/store/index_store.h"
#include "services/kovaelasticd/store/scrubber.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

/// An open index: its store and the thread that alone changes it. Any number of threads may call any member.
///
/// Changes of several callers share a transaction; a commit that several wait for is made once. What nobody commits is
/// committed after a while, or after kAutoCommitBytes. When changes that were answered with success are lost (a full
/// disk, or a process that died: a marker file beside the index tells), the next commit fails, so that the sender
/// of the changes sends them again. While the thread has nothing else to do, it compares names with rules that have
/// changed, clears what is left of deleted folders, and has the scrubber look after the file.
///
/// An index whose file has an older format is upgraded first: until then it has no store, and only Search and Stat are
/// answered, from the old file.
class Index {
 public:
  static constexpr std::chrono::milliseconds kAutoCommitAfter{5000};
  static constexpr int64_t kAutoCommitBytes = 64 << 20;

  /// `marker_path` is the file that exists while there are uncommitted changes. `on_damage` is called, by any thread,
  /// when the store or the scrubber, which may be null, finds the file damaged. With an `upgrade`, `store` is null.
  Index(
      std::unique_ptr<IndexStore> store, std::string marker_path,
      std::chrono::milliseconds auto_commit_after = kAutoCommitAfter, std::function<void()> on_damage = [] {},
      std::unique_ptr<Scrubber> scrubber = nullptr, std::unique_ptr<IndexUpgrade> upgrade = nullptr);
  Index(const Index&) = delete;
  Index& operator=(const Index&) = delete;
  /// Commits and closes.
  ~Index();

  using Job = std::function<void(IndexStore&)>;
  /// Has `job` run by the index's thread and waits for it; what it throws is thrown here. After kEngineStorage the
  /// changes since the last commit are gone.
  /// @throws Error kEngineIndexPaused when the index was closed meanwhile; kEngineIndexUpgrading.
  void Write(const Job& job);
  /// The same for a job that changes nothing.
  void Read(const Job& job);
  /// Makes everything that was answered before durable.
  void Commit();
  /// Search and Stat run on the caller's thread and see the last commit.
  SearchReply Search(const SearchRequest& request);
  StoreStat Stat();
  /// While documents of an index that came without access records are still to be given theirs: how many of a hundred
  /// have one, at most 99. Costs nothing otherwise.
  std::optional<int> PreparingPercent();
  /// Which names the share does not show, a text of NameRules. The thread compares all names with them when they are
  /// others than before; costs nothing otherwise.
  void SetNameRules(const std::string& rules);
  /// Whether askers with these rules can be answered.
  bool Obeys(const std::string& rules);
  /// The number of changes that are not committed yet.
  int64_t Uncommitted() const { return uncommitted_; }
  /// Nothing when the index has the present format.
  std::optional<UpgradeProgress> Upgrading();
  /// Commits and closes the store; waits for what runs.
  void Close();

 private:
  /// kRead and kWrite have a job; kCommit is answered once a commit after it is on the disk.
  enum class Kind { kRead, kWrite, kCommit };
  /// One call of Write, Read or Commit; on the stack of its caller, who waits until it is done.
  struct Task {
    Kind kind;
    const Job* job;
    std::exception_ptr failure;  ///< set by the thread before `done`
    bool done = false;           ///< guarded by mutex_
  };

  /// Queues a task and waits until it is done.
  void Submit(Kind kind, const Job* job);
  template <typename Use>
  auto Reading(Use use);
  void TakeUpgraded();
  bool WaitForStore();
  void ThreadMain();
  std::optional<std::chrono::steady_clock::time_point> NextOwnWork() const;
  std::deque<Task*> WaitForTasks();
  void Execute(Task& task);
  void RunChange(Task& task);
  void CommitFor(const std::deque<Task*>& waiting);
  void CommitByItself();
  void CommitStore();
  void DoOwnWork(bool busy);
  void PlanGiveBack();
  void Clear(bool busy);
  void ObeyNames(bool busy);
  void Scrub();
  void LoseChanges();
  void Mark();
  void Unmark();
  /// Runs what uses the store; on_damage_ is called when that finds the file damaged.
  template <typename Run>
  auto ReportingDamage(Run run) {
    try {
      return run();
    } catch (const IndexDamaged&) {
      on_damage_();
      throw;
    }
  }

  /// Held for reading by a search and a figure of the store, for writing by Close and at the end of an upgrade. The
  /// thread, which alone writes to the store, uses it without: Close waits for its end first.
  base::SharedMutex store_mutex_;
  base::Mutex readers_mutex_;  ///< held by each reader until it has store_mutex_, so that a writer is not starved
  std::unique_ptr<IndexStore> store_;
  std::unique_ptr<IndexUpgrade> upgrade_;  ///< until Close, also when it is complete
  std::unique_ptr<Scrubber> scrubber_;     ///< of the thread alone, until Close
  const std::string marker_path_;
  const std::chrono::milliseconds auto_commit_after_;
  const std::function<void()> on_damage_;

  base::Mutex mutex_;
  base::ConditionVariable wake_thread_;
  base::ConditionVariable wake_callers_;             ///< some tasks are done
  std::deque<Task*> tasks_ BASE_GUARDED_BY(mutex_);  ///< of callers that wait, in the order of their calls
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  bool upgrading_ BASE_GUARDED_BY(mutex_) = false;  ///< there is no store yet
  std::string name_rules_ BASE_GUARDED_BY(mutex_);
  std::atomic<bool> compares_names_{false};  ///< the store does not obey them yet, as far as is known

  // Of the thread alone, except for reading the count and what is said otherwise.
  std::atomic<int64_t> uncommitted_{0};
  std::atomic<bool> gives_back_{false};  ///< the thread asks for what it may give back; also set by searches
  bool marked_ = false;                  ///< the marker file is there
  bool lost_ = false;  ///< changes that were answered with success are gone, and no commit has failed for it yet
  std::chrono::steady_clock::time_point auto_commit_at_;  ///< while uncommitted_ is above 0
  std::chrono::steady_clock::time_point clear_at_;        ///< while documents are to be cleared
  std::chrono::steady_clock::time_point obey_at_;         ///< while names are to be compared

  std::thread thread_;
};

}  // namespace ferrox::engine
