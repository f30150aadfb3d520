#include "services/kovanotifyd/notifier.h"

#include <poll.h>
#include <syslog.h>

#include <algorithm>
#include <future>
#include <memory>
#include <utility>

#include "common/log.h"

namespace ferrox::notifyd {

namespace {

using SteadyClock = std::chrono::steady_clock;
using TimePoint = SteadyClock::time_point;

/// After which the registry and the roots' folders are examined although nothing was reported; the shorter one while a
/// root waits for its folder.
constexpr std::chrono::seconds kExamineInterval{30};
constexpr std::chrono::seconds kExamineIntervalWaiting{3};
/// What one turn of the loop may spend on WatchSet::Advance.
constexpr std::chrono::milliseconds kSlice{20};
/// So many changes in one read are a sign that the kernel's queue is filling: the next read does not wait for a batch.
constexpr uint64_t kBusyChanges = 1000;
/// For the loop's answer, beside the time that a sync may take.
constexpr std::chrono::seconds kAnswerTimeout{10};
constexpr char kStopping[] = "the notification daemon is being stopped; start it with 'fileindexctl up'";

int MillisecondsUntil(TimePoint due) {
  if (due == TimePoint::max()) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(due - SteadyClock::now()).count();
  return static_cast<int>(std::clamp<int64_t>(left, 0, 3600 * 1000));
}

/// Waits for what the loop promised to another thread. A broken promise means that the loop has ended.
template <typename Result>
Result Await(std::future<Result> future, std::chrono::milliseconds at_most, const char* late) {
  if (future.wait_for(at_most) != std::future_status::ready) throw Error(Error::kInternal, late);
  try {
    return future.get();
  } catch (const std::future_error&) {
    throw Error(Error::kInternal, kStopping);
  }
}

bool StartsWithAny(const std::string& path, const std::vector<std::string>& beginnings) {
  return std::any_of(beginnings.begin(), beginnings.end(),
                     [&path](const std::string& beginning) { return path.starts_with(beginning); });
}

}  // namespace

Notifier::Notifier(Options options)
    : options_(std::move(options)),
      registry_(options_.registry_folder, options_.read_registry),
      router_(options_.router),
      watches_(std::move(options_.ways), options_.scans, *this),
      syncs_(std::move(options_.cookies)) {
  due_.scan = SteadyClock::now() + options_.scan_interval;
}

Notifier::~Notifier() { Close(); }

void Notifier::Run(int stop_fd) {
  ReadRegistry();
  while (!is_stopping_) Step(stop_fd);
  Close();
  for (size_t way = 0; way < watches_.Ways(); ++way) (void)watches_.Read(way);
  const std::string problem = router_.FlushAll(SteadyClock::now());
  if (!problem.empty()) Log(LOG_WARNING, "stopping: %s", problem.c_str());
}

/// One turn of the loop: waits for something to do, and does it.
void Notifier::Step(int stop_fd) {
  Wait(stop_fd);
  tasks_.RunAll();
  RunDue();
  if (syncs_.IsWanted()) BeginSync();
  if (SteadyClock::now() >= due_.read || syncs_.IsRunning()) ReadChanges();
  if (has_work_) has_work_ = watches_.Advance(kSlice);
  if (disturbed_ || watches_.IsDisturbed()) {
    watches_.Examine();
    ScheduleExamination();
  }
  due_.flush = router_.Flush(SteadyClock::now());
  if (syncs_.IsRunning()) ContinueSync();
}

Notifier::TimePoint Notifier::NextDue() const {
  if (has_work_ || registry_changed_ || syncs_.IsWanted()) return SteadyClock::now();
  TimePoint due = std::min({due_.read, due_.flush, due_.examine, due_.expire});
  if (watches_.Roots().HasScanned()) due = std::min(due, due_.scan);
  return due;
}

void Notifier::Wait(int stop_fd) {
  std::vector<pollfd> polled = {{stop_fd, POLLIN, 0}, {tasks_.Fd(), POLLIN, 0}, {registry_.Fd(), POLLIN, 0}};
  const size_t disturbances = polled.size();
  for (const pollfd& disturbance : watches_.Disturbances()) polled.push_back(disturbance);
  const size_t changes = polled.size();
  // While a batch gathers, the watchers' descriptors are readable all the time and would end the wait at once.
  const bool is_gathering = due_.read != TimePoint::max() && !syncs_.IsRunning();
  for (size_t way = 0; !is_gathering && way < watches_.Ways(); ++way) polled.push_back({watches_.FdOf(way), POLLIN, 0});
  if (poll(polled.data(), polled.size(), MillisecondsUntil(NextDue())) <= 0) return;
  const auto is_ready = [&polled](size_t i) { return polled[i].revents != 0; };
  is_stopping_ = is_ready(0);
  registry_changed_ = registry_changed_ || is_ready(2);
  for (size_t i = disturbances; i < changes; ++i) disturbed_ = disturbed_ || is_ready(i);
  for (size_t i = changes; i < polled.size(); ++i) {
    if (is_ready(i)) due_.read = std::min(due_.read, SteadyClock::now() + options_.batch);
  }
}

void Notifier::RunDue() {
  const TimePoint now = SteadyClock::now();
  if (registry_changed_ || now >= due_.examine) ReadRegistry();
  if (now >= due_.scan) {
    watches_.Scan();
    due_.scan = now + options_.scan_interval;
  }
  due_.expire = syncs_.Expire(now, SyncState());
}

void Notifier::ReadRegistry() {
  registry_changed_ = false;
  registry_.Read();
  router_.SetQueues(registry_.Current().Queues());
  watches_.Follow(registry_.Current().list);
  ScheduleExamination();
}

/// After an examination, which may have given the watchers work: says when the next one is due.
void Notifier::ScheduleExamination() {
  disturbed_ = false;
  has_work_ = true;
  const bool is_waiting = watches_.Roots().HasMissing();
  due_.examine = SteadyClock::now() + (is_waiting ? kExamineIntervalWaiting : kExamineInterval);
}

void Notifier::ReadChanges() {
  const uint64_t before = changes_;
  for (size_t way = 0; way < watches_.Ways(); ++way) {
    if (watches_.Read(way)) syncs_.OnAllRead(way);
  }
  has_work_ = true;
  const bool is_busy = changes_ - before >= kBusyChanges;
  due_.read = is_busy ? SteadyClock::now() : TimePoint::max();
}

void Notifier::OnChange(Change change) {
  ++changes_;
  const std::vector<std::string>& own = options_.own_paths;
  if (StartsWithAny(change.path, own) && (change.old_path.empty() || StartsWithAny(change.old_path, own))) return;
  router_.Put(change, SteadyClock::now());
}

void Notifier::OnCompare(const std::string& path) { router_.PutComparison(path); }

void Notifier::OnLost(size_t way) {
  ++lost_;
  Log(LOG_WARNING, "the kernel dropped changes (%s); what it was to report is compared with the disk",
      watches_.NameOf(way).c_str());
  syncs_.OnLost(way);
}

void Notifier::OnCookie(size_t way) { syncs_.OnCookie(way); }

void Notifier::BeginSync() {
  ReadRegistry();
  watches_.Scan();
  syncs_.Begin(watches_.Roots());
}

void Notifier::ContinueSync() {
  if (!syncs_.IsDone(watches_.Roots())) return;
  SyncRounds::Problems problems;
  const std::string held = router_.FlushAll(SteadyClock::now());
  if (!held.empty()) problems.push_back(held);
  for (const auto& others : {registry_.Current().problems, watches_.Roots().Problems()}) {
    problems.insert(problems.end(), others.begin(), others.end());
  }
  syncs_.End(problems);
}

/// What a sync waits for, in a sentence.
std::string Notifier::SyncState() const {
  std::string state;
  for (const size_t way : syncs_.Outstanding()) state += (state.empty() ? "" : ", ") + watches_.NameOf(way);
  if (!state.empty()) return "changes are still being read (" + state + ")";
  if (watches_.Roots().IsSettingUp()) return "folders are still being set up to be watched";
  return "the notification daemon is busy";
}

NotifierStatus Notifier::MakeStatus() const {
  NotifierStatus status;
  status.queues = QueueStatusOf(registry_.Current(), watches_, router_);
  status.changes = changes_;
  status.lost = lost_;
  for (const auto& problems : {options_.problems, registry_.Current().problems, watches_.Roots().Problems()}) {
    status.problems.insert(status.problems.end(), problems.begin(), problems.end());
  }
  return status;
}

std::vector<std::string> Notifier::Sync(std::chrono::milliseconds timeout) {
  auto promise = std::make_shared<std::promise<SyncRounds::Outcome>>();
  std::future<SyncRounds::Outcome> future = promise->get_future();
  const TimePoint deadline = SteadyClock::now() + timeout;
  Post([this, promise, deadline] {
    syncs_.Add(std::move(*promise), deadline);
    due_.expire = std::min(due_.expire, deadline);
  });
  promise.reset();
  SyncRounds::Outcome outcome = Await(std::move(future), timeout + kAnswerTimeout, "the notification daemon is busy");
  if (!outcome.failure.empty()) throw Error(Error::kInternal, outcome.failure);
  return std::move(outcome.problems);
}

NotifierStatus Notifier::Status() {
  auto promise = std::make_shared<std::promise<NotifierStatus>>();
  std::future<NotifierStatus> future = promise->get_future();
  Post([this, promise] { promise->set_value(MakeStatus()); });
  promise.reset();
  return Await(std::move(future), kAnswerTimeout, "the notification daemon is busy");
}

void Notifier::Post(TaskQueue::Task task) {
  if (!tasks_.Post(std::move(task))) throw Error(Error::kInternal, kStopping);
}

/// Requests that wait fail by a broken promise (Await), later ones by Post.
void Notifier::Close() {
  tasks_.Close();
  syncs_.DropRequests();
}

}  // namespace ferrox::notifyd
