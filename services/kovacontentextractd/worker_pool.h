#pragma once

#include <array>
#include <chrono>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include <json/value.h>

#include <kova/content_type.h>

#include "base/mutex.h"
#include "services/kovacontentextractd/answer.h"
#include "services/kovacontentextractd/region.h"
#include "services/kovacontentextractd/worker_process.h"
#include "services/kovacontentextractd/worker_template.h"

namespace ferrox::extract {

/// Workers of all programs, at most workers_max together. They are made when they are needed, ended when they have read
/// files_per_worker files or have been idle for idle_time, and replaced when a file has killed them; so are the
/// templates that they are forked from.
///
/// A file is blamed only for what it did itself: a worker that ended before it had seen the file is replaced and the
/// file asked for again; one that crashes after having read other files too, whose traces in its memory may be the
/// cause, has the file read once more by a new worker. Any thread may call any member.
class WorkerPool {
 public:
  struct Options {
    /// The path of each program, of those too that are not installed.
    std::array<std::string, kova::content::kPrograms> programs;
    std::string empty_folder;  ///< what workers see of the file system, where that can be arranged
    /// Two more than the index daemon reads at a time while nothing is urgent.
    unsigned workers_max = std::max(std::thread::hardware_concurrency(), 2U) + 2;
    unsigned files_per_worker = 200;
    std::chrono::milliseconds longest_read = std::chrono::seconds(30);
    std::chrono::milliseconds idle_time = std::chrono::seconds(30);
  };

  explicit WorkerPool(const Options& options);
  WorkerPool(const WorkerPool&) = delete;
  WorkerPool& operator=(const WorkerPool&) = delete;
  ~WorkerPool();

  /// Starts a worker, which tells what of the sandbox this kernel lacks. @throws Error kInternal when that fails.
  void Probe(kova::content::Program program);
  /// Whether it is installed now.
  bool Has(kova::content::Program program) const;

  /// Has a file read; waits for a free worker, then at most for the longest read. From any thread. A file that kills
  /// its worker, keeps it too long or makes it lie has only "_KOVAExtractError", whatever `text` was handed before.
  /// @throws Error kInternal when no worker can be started.
  Answer Read(kova::content::Program program, const Task& task, const TextSink& text);

  /// Lets all who have a file read fail soon, with kInternal and no blame, and everybody from now on.
  void Stop();

  /// "workers" and "workers_max", "reading" (how many read a file), "held" (that cannot be ended), "missing" (what the
  /// sandbox lacks), "not_installed" (names of programs), "files" and "blamed" since the daemon's start.
  Json::Value Status() const;

 private:
  using SteadyClock = std::chrono::steady_clock;
  /// A worker without work.
  struct Idle {
    std::unique_ptr<WorkerProcess> worker;
    kova::content::Program program;
    SteadyClock::time_point since;
  };

  /// What makes the workers of a program; none when none was needed for long.
  struct Prepared {
    base::Mutex mutex;  ///< held while a template starts or forks, which takes milliseconds; taken before the pool's
    std::unique_ptr<WorkerTemplate> process BASE_GUARDED_BY(mutex);
    SteadyClock::time_point used BASE_GUARDED_BY(mutex);
  };

  class Lease;  ///< a worker on loan
  class Asked;  ///< its time with a file
  std::unique_ptr<WorkerProcess> TakeIdle(kova::content::Program program) BASE_REQUIRES(mutex_);
  std::unique_ptr<WorkerProcess> Take(kova::content::Program program, bool fresh);
  /// Takes a worker back, or notes that one on loan has ended.
  void Give(std::unique_ptr<WorkerProcess> worker, kova::content::Program program);
  std::unique_ptr<WorkerProcess> Start(kova::content::Program program);
  std::unique_ptr<WorkerProcess> Fork(kova::content::Program program);
  Prepared& PreparedFor(kova::content::Program program) { return prepared_[static_cast<size_t>(program)]; }
  /// Ends a program's template; the next worker is forked from a new one.
  void EndPrepared(kova::content::Program program);
  void EndIdle();
  bool EndIdleTemplates(SteadyClock::time_point old);
  void Count(bool answered);
  void FailIfStopping() const BASE_REQUIRES(mutex_);

  const Options options_;
  std::array<Prepared, kova::content::kPrograms> prepared_;
  mutable base::Mutex mutex_;
  base::ConditionVariable given_;  ///< a worker came back to the pool
  base::ConditionVariable
      something_to_end_;  ///< for the thread that ends idle ones: a worker is busy, or the pool stops
  bool nothing_to_end_ BASE_GUARDED_BY(mutex_) = false;
  std::vector<Idle> idle_ BASE_GUARDED_BY(mutex_);  ///< the longest idle first
  unsigned busy_ BASE_GUARDED_BY(mutex_) = 0;       ///< leased out, or being started
  uint64_t files_ BASE_GUARDED_BY(mutex_) = 0;      ///< read since the daemon's start
  uint64_t blamed_ BASE_GUARDED_BY(mutex_) = 0;     ///< of these, those that cost their worker
  Json::Value missing_ BASE_GUARDED_BY(mutex_) = Json::Value(Json::arrayValue);
  bool stopping_ BASE_GUARDED_BY(mutex_) = false;
  std::vector<WorkerProcess*> asked_ BASE_GUARDED_BY(mutex_);  ///< those that are reading a file
  std::thread ender_;                                          ///< last: it uses all of the above
};

}  // namespace ferrox::extract
