#include "services/kovacontentextractd/worker_pool.h"

#include <malloc.h>
#include <syslog.h>

#include <algorithm>
#include <utility>

#include "common/error.h"
#include "common/log.h"

namespace ferrox::extract {

namespace {

using kova::content::Program;
using Outcome = WorkerProcess::Outcome;

/// A worker may have ended while nobody looked; more than one in a row is no accident.
constexpr int kAttempts = 3;

/// What a document says of a file that was not answered for.
const char* Reason(Outcome outcome) {
  switch (outcome) {
    case Outcome::kTookTooLong:
      return "took too long";
    case Outcome::kNoMemory:
      return "needs too much memory";
    case Outcome::kNonsense:
      return "confused the reader";
    default:
      return "crashed the reader";
  }
}

}  // namespace

/// A worker while it is busy; not given back, it ends.
class WorkerPool::Lease {
 public:
  Lease(WorkerPool& pool, Program program) : pool_(pool), program_(program), worker_(pool.Take(program)) {}
  Lease(const Lease&) = delete;
  Lease& operator=(const Lease&) = delete;
  ~Lease() { pool_.Give(std::move(worker_), program_); }

  WorkerProcess& Worker() { return *worker_; }
  void End() { worker_.reset(); }

 private:
  WorkerPool& pool_;
  Program program_;
  std::unique_ptr<WorkerProcess> worker_;
};

WorkerPool::WorkerPool(const Options& options) : options_(options), ender_([this] { EndIdle(); }) {}

WorkerPool::~WorkerPool() {
  {
    const std::lock_guard guard(mutex_);
    stopping_ = true;
  }
  changed_.notify_all();
  ender_.join();
}

void WorkerPool::Probe(Program program) { const Lease lease(*this, program); }

Answer WorkerPool::Read(Program program, const Task& task) {
  std::string bytes;
  Answer answer;
  Outcome outcome = Outcome::kNotAsked;
  for (int attempt = 0; attempt < kAttempts && outcome == Outcome::kNotAsked; ++attempt) {
    Lease lease(*this, program);
    outcome = lease.Worker().Ask(task, options_.longest_read, bytes);
    if (outcome == Outcome::kAnswered && !ParseAnswer(std::move(bytes), answer)) outcome = Outcome::kNonsense;
    if (outcome != Outcome::kAnswered) lease.End();
  }
  FERROX_FAIL_IF(outcome == Outcome::kNotAsked, Error::kInternal, "the workers end before they are given a file");
  const std::lock_guard guard(mutex_);
  ++files_;
  if (outcome == Outcome::kAnswered) return answer;
  ++blamed_;
  Answer blame;
  blame.fields["_KOVAExtractError"] = Reason(outcome);
  return blame;
}

std::unique_ptr<WorkerProcess> WorkerPool::TakeIdle(Program program) {
  const auto last = std::find_if(idle_.rbegin(), idle_.rend(), [&](const Idle& one) { return one.program == program; });
  if (last == idle_.rend()) return nullptr;
  std::unique_ptr<WorkerProcess> worker = std::move(last->worker);
  idle_.erase(std::next(last).base());
  return worker;
}

std::unique_ptr<WorkerProcess> WorkerPool::Take(Program program) {
  std::unique_ptr<WorkerProcess> given_up;
  {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return busy_ < options_.workers_max; });
    ++busy_;
    while (std::unique_ptr<WorkerProcess> worker = TakeIdle(program)) {
      if (worker->IsReady()) return worker;
    }
    if (busy_ + idle_.size() > options_.workers_max) {  // those of other programs make room
      given_up = std::move(idle_.front().worker);
      idle_.erase(idle_.begin());
    }
  }
  try {
    return Start(program);
  } catch (...) {
    Give(nullptr, program);
    throw;
  }
}

std::unique_ptr<WorkerProcess> WorkerPool::Start(Program program) {
  auto worker = std::make_unique<WorkerProcess>(options_.programs[static_cast<size_t>(program)], options_.empty_folder);
  const std::lock_guard guard(mutex_);
  if (missing_ != worker->Missing()) {
    missing_ = worker->Missing();
    for (const Json::Value& piece : missing_) {
      Log(LOG_WARNING, "the sandbox of the workers lacks %s on this kernel", piece.asString().c_str());
    }
  }
  return worker;
}

void WorkerPool::Give(std::unique_ptr<WorkerProcess> worker, Program program) {
  const bool kept = worker != nullptr && worker->FilesRead() < options_.files_per_worker && worker->IsReady();
  if (!kept) worker.reset();
  {
    const std::lock_guard guard(mutex_);
    --busy_;
    if (kept) idle_.push_back({std::move(worker), program, SteadyClock::now()});
  }
  changed_.notify_all();
}

/// The thread that ends workers which have had nothing to do for long.
void WorkerPool::EndIdle() {
  std::unique_lock lock(mutex_);
  while (!stopping_) {
    if (idle_.empty()) {
      changed_.wait(lock);
    } else if (const auto due = idle_.front().since + options_.idle_time; SteadyClock::now() < due) {
      changed_.wait_until(lock, due);
    } else {
      std::unique_ptr<WorkerProcess> ended = std::move(idle_.front().worker);
      idle_.erase(idle_.begin());
      lock.unlock();
      ended.reset();
      (void)malloc_trim(0);
      lock.lock();
    }
  }
}

Json::Value WorkerPool::Status() const {
  const std::lock_guard guard(mutex_);
  Json::Value status;
  status["workers"] = Json::UInt64(busy_ + idle_.size());
  status["workers_max"] = options_.workers_max;
  status["missing"] = missing_;
  status["files"] = Json::UInt64(files_);
  status["blamed"] = Json::UInt64(blamed_);
  return status;
}

}  // namespace ferrox::extract
