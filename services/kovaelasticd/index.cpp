#include "services/kovaelasticd/index.h"

#include <fcntl.h>
#include <syslog.h>
#include <unistd.h>

#include "base/unique_fd.h"
#include "common/log.h"
#include "services/kovaelasticd/sqlite_db.h"

namespace ferrox::engine {

namespace {

using SteadyClock = std::chrono::steady_clock;

constexpr char kLostText[] =
    "changes since the last commit were lost, because the engine was killed or its disk was full; send them again";

}  // namespace

Index::Index(std::unique_ptr<IndexStore> store, std::string marker_path, std::chrono::milliseconds auto_commit_after,
             std::function<void()> on_damage)
    : store_(std::move(store)),
      marker_path_(std::move(marker_path)),
      auto_commit_after_(auto_commit_after),
      on_damage_(std::move(on_damage)) {
  lost_ = access(marker_path_.c_str(), F_OK) == 0;
  marked_ = lost_;
  thread_ = std::thread(&Index::ThreadMain, this);
}

Index::~Index() { Close(); }

/// What the store does; that its file is damaged is told.
template <typename Run>
auto Index::Watched(Run run) {
  try {
    return run();
  } catch (const IndexDamaged&) {
    on_damage_();
    throw;
  }
}

void Index::Write(const Job& job) { Submit(Kind::kWrite, &job); }

void Index::Read(const Job& job) { Submit(Kind::kRead, &job); }

void Index::Commit() { Submit(Kind::kCommit, nullptr); }

void Index::Submit(Kind kind, const Job* job) {
  Task task{kind, job, nullptr, false};
  {
    std::unique_lock<std::mutex> lock(mutex_);
    if (stopping_) throw Error(Error::kEngineIndexPaused, "the index was closed meanwhile; resume it");
    tasks_.push_back(&task);
    wake_thread_.notify_one();
    wake_callers_.wait(lock, [&task] { return task.done; });
  }
  if (task.failure != nullptr) std::rethrow_exception(task.failure);
}

SearchReply Index::Search(const SearchRequest& request) {
  const std::shared_lock<std::shared_mutex> guard(store_mutex_);
  if (store_ == nullptr) throw Error(Error::kEngineIndexPaused, "the index was closed meanwhile; resume it");
  return Watched([&] { return store_->Search(request); });
}

StoreStat Index::Stat() {
  const std::shared_lock<std::shared_mutex> guard(store_mutex_);
  if (store_ == nullptr) throw Error(Error::kEngineIndexPaused, "the index was closed meanwhile; resume it");
  return Watched([&] { return store_->Stat(); });
}

void Index::Close() {
  {
    const std::lock_guard<std::mutex> lock(mutex_);
    stopping_ = true;
    wake_thread_.notify_one();
  }
  if (thread_.joinable()) thread_.join();
  const std::unique_lock<std::shared_mutex> guard(store_mutex_);
  store_.reset();
}

/// Takes all that waits; nothing when the time for a commit has come, or the end.
std::deque<Index::Task*> Index::WaitForTasks() {
  std::unique_lock<std::mutex> lock(mutex_);
  const auto ready = [this] { return stopping_ || !tasks_.empty(); };
  if (uncommitted_ > 0) {
    (void)wake_thread_.wait_until(lock, auto_commit_at_, ready);
  } else {
    wake_thread_.wait(lock, ready);
  }
  std::deque<Task*> tasks;
  tasks.swap(tasks_);
  return tasks;
}

void Index::ThreadMain() {
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
      const std::lock_guard<std::mutex> lock(mutex_);
      for (Task* task : tasks) task->done = true;
      wake_callers_.notify_all();
      stop = stopping_ && tasks_.empty();
    }
    const bool due = uncommitted_ > 0 &&
                     (stop || SteadyClock::now() >= auto_commit_at_ || store_->UncommittedBytes() >= kAutoCommitBytes);
    if (due) CommitByItself();
    if (stop) return;
  }
}

void Index::Execute(Task& task) {
  try {
    Watched([&] { task.kind == Kind::kRead ? (*task.job)(*store_) : RunChange(task); });
  } catch (...) {
    task.failure = std::current_exception();
  }
}

/// Any failure that the store did not foresee leaves the transaction in an unknown state: it is given up.
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
    Watched([&] { store_->Commit(); });
  } catch (...) {
    LoseChanges();
    throw;
  }
  uncommitted_ = 0;
}

void Index::CommitFor(const std::deque<Task*>& waiting) {
  std::exception_ptr failure;
  try {
    CommitStore();
    if (lost_) throw Error(Error::kEngineStorage, kLostText);
  } catch (...) {
    failure = std::current_exception();
  }
  lost_ = false;  // whoever waits is told now
  Unmark();
  for (Task* task : waiting) task->failure = failure;
}

void Index::CommitByItself() {
  try {
    CommitStore();
    if (!lost_) Unmark();
  } catch (const std::exception&) {
    // Logged where it arose; the next commit that somebody asks for fails.
  }
}

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
