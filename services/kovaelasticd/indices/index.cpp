#include "services/kovaelasticd/indices/index.h"

#include <fcntl.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>

#include "base/unique_fd.h"
#include "common/log.h"
#include "services/kovaelasticd/store/sqlite_db.h"

namespace ferrox::engine {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr char kClosedText[] = "the index was closed meanwhile; resume it";
constexpr char kLostText[] =
    "changes since the last commit were lost, because the engine was killed or its disk was full; send them again";

}  // namespace

Index::Index(std::unique_ptr<IndexStore> store, std::string marker_path, std::chrono::milliseconds auto_commit_after,
             std::function<void()> on_damage, std::unique_ptr<Scrubber> scrubber, std::unique_ptr<IndexUpgrade> upgrade)
    : store_(std::move(store)),
      upgrade_(std::move(upgrade)),
      scrubber_(std::move(scrubber)),
      marker_path_(std::move(marker_path)),
      auto_commit_after_(auto_commit_after),
      on_damage_(std::move(on_damage)) {
  lost_ = access(marker_path_.c_str(), F_OK) == 0;
  marked_ = lost_;
  upgrading_ = upgrade_ != nullptr;
  thread_ = std::thread(&Index::ThreadMain, this);
  if (upgrade_ != nullptr) upgrade_->Start([this] { TakeUpgraded(); }, on_damage_);
}

Index::~Index() { Close(); }

void Index::Write(const Job& job) { Submit(Kind::kWrite, &job); }

void Index::Read(const Job& job) { Submit(Kind::kRead, &job); }

void Index::Commit() { Submit(Kind::kCommit, nullptr); }

void Index::Submit(Kind kind, const Job* job) {
  Task task{kind, job, nullptr, false};
  {
    const base::MutexLock lock(mutex_);
    if (stopping_) throw Error(Error::kEngineIndexPaused, kClosedText);
    if (upgrading_) throw Error(Error::kEngineIndexUpgrading, DescribeUpgrade(upgrade_->Progress()));
    tasks_.push_back(&task);
    wake_thread_.NotifyOne();
    while (!task.done) wake_callers_.Wait(mutex_);
  }
  if (task.failure != nullptr) std::rethrow_exception(task.failure);
}

/// Has `use` read the store or, where there is none yet, the file that is being upgraded.
template <typename Use>
auto Index::Reading(Use use) {
  base::MutexLock entering(readers_mutex_);
  const base::ReaderLock guard(store_mutex_);
  entering.Unlock();
  if (store_ == nullptr && upgrade_ == nullptr) throw Error(Error::kEngineIndexPaused, kClosedText);
  return ReportingDamage([&] { return store_ != nullptr ? use(*store_) : use(*upgrade_); });
}

SearchReply Index::Search(const SearchRequest& request) {
  SearchReply reply = Reading([&](auto& from) { return from.Search(request); });
  PlanGiveBack();
  return reply;
}

StoreStat Index::Stat() {
  return Reading([](auto& from) { return from.Stat(); });
}

std::optional<int> Index::PreparingPercent() {
  {
    const base::ReaderLock guard(store_mutex_);
    if (store_ != nullptr && !store_->Preparing()) return std::nullopt;
  }
  const StoreStat stat = Stat();
  if (!stat.preparing) return std::nullopt;
  return static_cast<int>(
      std::min<int64_t>(99, 100 - stat.without_access * 100 / std::max<int64_t>(1, stat.documents)));
}

std::optional<UpgradeProgress> Index::Upgrading() {
  const base::ReaderLock guard(store_mutex_);
  if (store_ != nullptr || upgrade_ == nullptr) return std::nullopt;
  return upgrade_->Progress();
}

/// By the upgrade's thread, once the new file is written. Searches that run finish first, others wait a moment.
void Index::TakeUpgraded() {
  const base::MutexLock entering(readers_mutex_);
  const base::WriterLock guard(store_mutex_);
  store_ = upgrade_->Finish();
  const base::MutexLock lock(mutex_);
  upgrading_ = false;
  wake_thread_.NotifyOne();
}

void Index::Close() {
  if (upgrade_ != nullptr) upgrade_->Stop();
  {
    const base::MutexLock lock(mutex_);
    stopping_ = true;
    wake_thread_.NotifyOne();
  }
  if (thread_.joinable()) thread_.join();
  const base::MutexLock entering(readers_mutex_);
  const base::WriterLock guard(store_mutex_);
  upgrade_.reset();
  scrubber_.reset();  // the last connection that is closed empties the log, and removes it: the store's
  store_.reset();
}

/// Waits for tasks and takes all of them; none when it is time for NextOwnWork, or the end.
std::deque<Index::Task*> Index::WaitForTasks() {
  const base::MutexLock lock(mutex_);
  while (!stopping_ && tasks_.empty()) {
    const auto own_work = NextOwnWork();
    if (!own_work.has_value()) {
      wake_thread_.Wait(mutex_);
    } else if (!wake_thread_.WaitUntil(mutex_, *own_work)) {
      break;
    }
  }
  std::deque<Task*> tasks;
  tasks.swap(tasks_);
  return tasks;
}

/// Nothing is submitted until there is a store. @return whether there is one; else the index is being closed.
bool Index::WaitForStore() {
  const base::MutexLock lock(mutex_);
  while (upgrading_ && !stopping_) wake_thread_.Wait(mutex_);
  return !upgrading_;
}

/// Runs tasks in turns: changes and reads of one turn in their order, then one commit for all of them that ask for it.
/// A commit waits for the disk; callers that come meanwhile share the next turn, so the rate of commits adapts to the
/// disk.
void Index::ThreadMain() {
  if (!WaitForStore()) return;
  for (;;) {
    const std::deque<Task*> tasks = WaitForTasks();
    std::deque<Task*> commits;
    for (Task* task : tasks) {
      if (task->kind == Kind::kCommit) {
        commits.push_back(task);
      } else {
        Execute(*task);
      }
    }
    if (!commits.empty()) CommitFor(commits);
    bool stop = false;
    {
      const base::MutexLock lock(mutex_);
      for (Task* task : tasks) task->done = true;
      wake_callers_.NotifyAll();
      stop = stopping_ && tasks_.empty();
    }
    const bool due = uncommitted_ > 0 &&
                     (stop || SteadyClock::now() >= auto_commit_at_ || store_->UncommittedBytes() >= kAutoCommitBytes);
    if (due) CommitByItself();
    if (stop) return;
    DoOwnWork(!tasks.empty());
  }
}

void Index::Execute(Task& task) {
  try {
    ReportingDamage([&] { task.kind == Kind::kRead ? (*task.job)(*store_) : RunChange(task); });
  } catch (...) {
    task.failure = std::current_exception();
  }
}

/// A bad request leaves the transaction as it was. Any other failure leaves it in an unknown state: it is rolled back,
/// and all changes since the last commit are lost.
void Index::RunChange(Task& task) {
  Mark();
  try {
    (*task.job)(*store_);
  } catch (const Error& error) {
    if (error.Code() == Error::kEngineStorage) LoseChanges();
    throw;
  } catch (...) {
    LoseChanges();
    throw;
  }
  if (uncommitted_++ == 0) auto_commit_at_ = SteadyClock::now() + auto_commit_after_;
}

void Index::LoseChanges() {
  lost_ = lost_ || uncommitted_ > 0;
  uncommitted_ = 0;
  try {
    store_->Rollback();
  } catch (const std::exception&) {
    // Logged where it arose; the next change meets the same fault and reports it.
  }
}

void Index::CommitStore() {
  try {
    ReportingDamage([&] { store_->Commit(); });
  } catch (...) {
    LoseChanges();
    throw;
  }
  uncommitted_ = 0;
}

/// Commits for the callers that wait for it. A commit also fails when earlier changes, answered with success, were
/// lost: the caller must send again what it sent since its last commit.
void Index::CommitFor(const std::deque<Task*>& waiting) {
  std::exception_ptr failure;
  try {
    CommitStore();
    if (lost_) throw Error(Error::kEngineStorage, kLostText);
  } catch (...) {
    failure = std::current_exception();
  }
  lost_ = false;  // reported to the callers by the failure below
  Unmark();
  for (Task* task : waiting) task->failure = failure;
}

/// Commits because of the time or the amount of changes. The marker stays where changes were lost.
void Index::CommitByItself() {
  try {
    CommitStore();
    if (!lost_) Unmark();
  } catch (const std::exception&) {
    // Logged where it arose; the next commit that somebody asks for fails.
  }
}

/// Makes the marker file: an engine that starts and finds it knows that the last one died with uncommitted changes. Not
/// synced: it tells of an engine that was killed, not of a host that lost power.
void Index::Mark() {
  if (marked_) return;
  const base::UniqueFd marker(open(marker_path_.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600));
  marked_ = marker.Valid();
}

void Index::Unmark() {
  if (!marked_) return;
  marked_ = unlink(marker_path_.c_str()) != 0;
}

}  // namespace ferrox::engine
