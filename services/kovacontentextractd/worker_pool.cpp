#include "services/kovacontentextractd/worker_pool.h"

#include <malloc.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <utility>

#include "common/error.h"
#include "common/log.h"
#include "wire/fields.h"

namespace ferrox::extract {

namespace {

using kova::content::Program;
using Outcome = WorkerProcess::Outcome;

/// How many workers are asked for one file, when they end before they have seen it: one may have died while it was
/// idle.
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

/// Takes over what a worker answered, once all of it has passed the checks: its JSON is of the fields that a reader may
/// set, the text lies in the region and is UTF-8, attachments lie within it. @return false for an answer that no reader
/// gives, which only a worker taken over by its file sends.
bool TakeChecked(const RawAnswer& raw, int region, const TextSink& text, Answer& answer) {
  std::vector<AttachedBytes> attachments;
  if (!ParseAnswer(raw.json, answer.fields, attachments) || !CopyText(region, raw.text_bytes, text)) return false;
  answer.text_bytes = raw.text_bytes;
  size_t attached_bytes = 0;
  for (AttachedBytes& one : attachments) {
    answer.attachments.push_back({std::move(one.name), CopyAttachment(region, one.offset, one.bytes)});
    attached_bytes += one.bytes;
  }
  if (attached_bytes > 0) FreeAttachments(region, attached_bytes);
  return true;
}

}  // namespace

/// A worker on loan from the pool; returned by the destructor, or ended by End.
class WorkerPool::Lease {
 public:
  Lease(WorkerPool& pool, Program program, bool fresh = false)
      : pool_(pool), program_(program), worker_(pool.Take(program, fresh)) {}
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

/// Registers a worker as reading a file, for Stop to interrupt.
class WorkerPool::Asked {
 public:
  /// @throws Error kInternal when the pool stops.
  Asked(WorkerPool& pool, WorkerProcess& worker) : pool_(pool), worker_(worker) {
    const base::MutexLock guard(pool_.mutex_);
    pool_.FailIfStopping();
    pool_.asked_.push_back(&worker_);
  }
  Asked(const Asked&) = delete;
  Asked& operator=(const Asked&) = delete;
  ~Asked() {
    const base::MutexLock guard(pool_.mutex_);
    std::erase(pool_.asked_, &worker_);
  }

 private:
  WorkerPool& pool_;
  WorkerProcess& worker_;
};

WorkerPool::WorkerPool(const Options& options) : options_(options), ender_([this] { EndIdle(); }) {}

WorkerPool::~WorkerPool() {
  Stop();
  ender_.join();
}

void WorkerPool::Stop() {
  const base::MutexLock guard(mutex_);
  stopping_ = true;
  for (WorkerProcess* worker : asked_) worker->Interrupt();
  something_to_end_.NotifyOne();
}

void WorkerPool::FailIfStopping() const {
  FERROX_FAIL_IF(stopping_, Error::kInternal, "content extraction is being stopped");
}

void WorkerPool::Probe(Program program) { const Lease lease(*this, program); }

bool WorkerPool::Has(Program program) const {
  return access(options_.programs[static_cast<size_t>(program)].c_str(), X_OK) == 0;
}

Answer WorkerPool::Read(Program program, const Task& task, const TextSink& text) {
  FERROX_FAIL_IF(ChildProcess::Held() >= options_.workers_max, Error::kInternal,
                 "as many workers as there may be hang in a file system that does not answer");
  Answer answer;
  Outcome outcome = Outcome::kNotAsked;
  bool fresh = false;
  for (int attempt = 0; attempt < kAttempts && outcome == Outcome::kNotAsked; ++attempt) {
    Lease lease(*this, program, fresh);
    RawAnswer raw;
    {
      const Asked asked(*this, lease.Worker());
      outcome = lease.Worker().Ask(task, options_.longest_read, raw);
    }
    if (outcome == Outcome::kAnswered && !TakeChecked(raw, lease.Worker().Region(), text, answer)) {
      outcome = Outcome::kNonsense;
    }
    // What an earlier file has done to the memory of its worker may end it now: one that has read no other decides.
    if (outcome == Outcome::kCrashed && lease.Worker().FilesRead() > 1) {
      outcome = Outcome::kNotAsked;
      fresh = true;
    }
    if (outcome != Outcome::kAnswered) lease.End();
  }
  FERROX_FAIL_IF(outcome == Outcome::kHeld, Error::kInternal, "the file system does not answer");
  FERROX_FAIL_IF(outcome == Outcome::kNotAsked, Error::kInternal, "the workers end before they are given a file");
  Count(outcome == Outcome::kAnswered);
  if (outcome == Outcome::kAnswered) return answer;
  // All workers forked from one template have the same layout of memory. A file that crashed one may have learnt
  // addresses that would help the next: its successors are forked from a template with another layout.
  EndPrepared(program);
  Answer blame;
  blame.fields[fileindex::elastic::k_KOVAExtractError] = Reason(outcome);
  return blame;
}

/// @throws Error kInternal when it was the pool that ended the worker.
void WorkerPool::Count(bool answered) {
  const base::MutexLock guard(mutex_);
  if (!answered) FailIfStopping();
  ++files_;
  if (!answered) ++blamed_;
}

/// The one that came back last: its memory is the likeliest to be in the processor's caches, and the others grow old.
std::unique_ptr<WorkerProcess> WorkerPool::TakeIdle(Program program) {
  const auto last = std::find_if(idle_.rbegin(), idle_.rend(), [&](const Idle& one) { return one.program == program; });
  if (last == idle_.rend()) return nullptr;
  std::unique_ptr<WorkerProcess> worker = std::move(last->worker);
  idle_.erase(std::next(last).base());
  return worker;
}

/// Waits for a place among workers_max, then takes an idle worker of the program or starts one. With `fresh`, one that
/// has read no other file.
std::unique_ptr<WorkerProcess> WorkerPool::Take(Program program, bool fresh) {
  std::unique_ptr<WorkerProcess> given_up;
  {
    const base::MutexLock lock(mutex_);
    while (busy_ >= options_.workers_max) given_.Wait(mutex_);
    ++busy_;
    if (std::exchange(nothing_to_end_, false)) something_to_end_.NotifyOne();
    while (std::unique_ptr<WorkerProcess> worker = fresh ? nullptr : TakeIdle(program)) {
      if (worker->IsReady()) return worker;
    }
    if (busy_ + idle_.size() > options_.workers_max) {  // those of other programs make room
      given_up = std::move(idle_.front().worker);
      idle_.erase(idle_.begin());
    }
  }
  given_up.reset();  // first, so that there are never more than there may be
  try {
    return Start(program);
  } catch (...) {
    Give(nullptr, program);
    throw;
  }
}

/// Has the program's template make a worker, and starts that where there is none.
std::unique_ptr<WorkerProcess> WorkerPool::Fork(Program program) {
  Prepared& prepared = PreparedFor(program);
  const base::MutexLock guard(prepared.mutex);
  prepared.used = SteadyClock::now();
  if (prepared.process == nullptr || !prepared.process->IsReady()) {
    prepared.process.reset();
    prepared.process =
        std::make_unique<WorkerTemplate>(options_.programs[static_cast<size_t>(program)], options_.empty_folder);
  }
  try {
    return std::make_unique<WorkerProcess>(*prepared.process);
  } catch (...) {
    prepared.process.reset();
    throw;
  }
}

void WorkerPool::EndPrepared(Program program) {
  Prepared& prepared = PreparedFor(program);
  const base::MutexLock guard(prepared.mutex);
  prepared.process.reset();
}

/// A new worker; what of the sandbox it lacks is logged when it is not what the last one lacked.
std::unique_ptr<WorkerProcess> WorkerPool::Start(Program program) {
  std::unique_ptr<WorkerProcess> worker = Fork(program);
  const base::MutexLock guard(mutex_);
  if (missing_ != worker->Missing()) {
    missing_ = worker->Missing();
    for (const Json::Value& piece : missing_) {
      Log(LOG_WARNING, "the sandbox of the workers lacks %s on this kernel", piece.asString().c_str());
    }
  }
  return worker;
}

void WorkerPool::Give(std::unique_ptr<WorkerProcess> worker, Program program) {
  const bool kept = worker != nullptr && worker->FilesRead() < options_.files_per_worker;
  if (!kept) worker.reset();
  {
    const base::MutexLock guard(mutex_);
    --busy_;
    if (kept) idle_.push_back({std::move(worker), program, SteadyClock::now()});
  }
  given_.NotifyOne();
}

/// The thread that ends what has had nothing to do for long.
void WorkerPool::EndIdle() {
  base::MutexLock lock(mutex_);
  while (!stopping_) {
    std::vector<std::unique_ptr<WorkerProcess>> ended;
    const auto old = SteadyClock::now() - options_.idle_time;
    for (; !idle_.empty() && idle_.front().since < old; idle_.erase(idle_.begin())) {
      ended.push_back(std::move(idle_.front().worker));
    }
    lock.Unlock();
    const bool templates_left = EndIdleTemplates(old);
    if (!ended.empty()) (void)malloc_trim(0);
    ended.clear();
    lock.Lock();
    nothing_to_end_ = busy_ == 0 && idle_.empty() && !templates_left;
    if (nothing_to_end_) {
      while (!stopping_ && nothing_to_end_) something_to_end_.Wait(mutex_);
    } else {
      const auto next_look = SteadyClock::now() + options_.idle_time / 4;
      while (!stopping_ && something_to_end_.WaitUntil(mutex_, next_look)) {
      }
    }
  }
}

/// @return whether there are others
bool WorkerPool::EndIdleTemplates(SteadyClock::time_point old) {
  bool left = false;
  for (Prepared& prepared : prepared_) {
    if (!prepared.mutex.TryLock()) {  // it forks just now, so it is in use
      left = true;
      continue;
    }
    if (prepared.used < old) prepared.process.reset();
    left = left || prepared.process != nullptr;
    prepared.mutex.Unlock();
  }
  return left;
}

Json::Value WorkerPool::Status() const {
  const base::MutexLock guard(mutex_);
  Json::Value status;
  status["workers"] = Json::UInt64(busy_ + idle_.size());
  status["workers_max"] = options_.workers_max;
  status["reading"] = Json::UInt64(asked_.size());
  status["held"] = Json::UInt64(ChildProcess::Held());
  status["missing"] = missing_;
  status["not_installed"] = Json::Value(Json::arrayValue);
  for (int i = 0; i < kova::content::kPrograms; ++i) {
    const auto program = static_cast<Program>(i);
    if (!Has(program)) status["not_installed"].append(kova::content::ProgramName(program));
  }
  status["files"] = Json::UInt64(files_);
  status["blamed"] = Json::UInt64(blamed_);
  return status;
}

}  // namespace ferrox::extract
