#include "services/kovanotifyd/notifier.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <utility>

#include "common/log.h"

namespace ferrox::notifyd {

namespace {

using SteadyClock = std::chrono::steady_clock;
using TimePoint = SteadyClock::time_point;

/// The registry and the folders are looked at so often, whether or not something was seen to change.
constexpr std::chrono::seconds kExamineInterval{30};
constexpr std::chrono::seconds kExamineIntervalWaiting{3};
constexpr std::chrono::milliseconds kSlice{20};
/// So many changes at once are a sign that the kernel's queue fills while nobody reads it.
constexpr uint64_t kBusyChanges = 1000;
constexpr std::chrono::seconds kStatusTimeout{10};
constexpr char kStopping[] = "the notification daemon is being stopped; start it with 'fileindexctl up'";

int MillisecondsUntil(TimePoint due) {
  if (due == TimePoint::max()) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(due - SteadyClock::now()).count();
  return static_cast<int>(std::clamp<int64_t>(left, 0, 3600 * 1000));
}

/// What the loop promised to another thread; a promise that the loop dropped is its end.
template <typename Result>
Result Await(std::future<Result> future, std::chrono::milliseconds at_most, const char* late) {
  if (future.wait_for(at_most) != std::future_status::ready) throw Error(Error::kInternal, late);
  try {
    return future.get();
  } catch (const std::future_error&) {
    throw Error(Error::kInternal, kStopping);
  }
}

}  // namespace

Notifier::Notifier(Options options)
    : options_(std::move(options)),
      registry_watch_(options_.registry_folder),
      router_(options_.router),
      watches_(std::move(options_.ways), options_.scans, *this),
      syncs_(watches_.Ways()),
      read_at_(TimePoint::max()),
      flush_at_(TimePoint::max()),
      scan_at_(SteadyClock::now() + options_.scan_interval),
      expire_at_(TimePoint::max()),
      wake_(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {
  FERROX_FAIL_IF(!wake_.Valid(), Error::kInternal, "eventfd: " + ErrnoText());
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

/// One turn: waits for something to do, and does it.
void Notifier::Step(int stop_fd) {
  Wait(stop_fd);
  RunTasks();
  DoWhatIsDue();
  if (syncs_.IsWanted()) BeginSync();
  if (SteadyClock::now() >= read_at_ || syncs_.IsRunning()) ReadChanges();
  if (has_work_) has_work_ = watches_.Advance(kSlice);
  if (disturbed_ || watches_.IsDisturbed()) {
    watches_.Examine();
    AfterExamination();
  }
  flush_at_ = router_.Flush(SteadyClock::now());
  if (syncs_.IsRunning()) ContinueSync();
}

Notifier::TimePoint Notifier::NextDue() const {
  if (has_work_ || registry_changed_ || syncs_.IsWanted()) return SteadyClock::now();
  TimePoint due = std::min({read_at_, flush_at_, examine_at_, expire_at_});
  if (watches_.HasScans()) due = std::min(due, scan_at_);
  return due;
}

void Notifier::Wait(int stop_fd) {
  std::vector<pollfd> polled = {{stop_fd, POLLIN, 0}, {wake_.Get(), POLLIN, 0}, {registry_watch_.Fd(), POLLIN, 0}};
  const size_t disturbances = polled.size();
  for (const pollfd& disturbance : watches_.Disturbances()) polled.push_back(disturbance);
  const size_t changes = polled.size();
  // While a batch gathers, or is known to be there, its descriptors would only end the wait.
  const bool is_gathering = read_at_ != TimePoint::max() && !syncs_.IsRunning();
  for (size_t way = 0; !is_gathering && way < watches_.Ways(); ++way) polled.push_back({watches_.FdOf(way), POLLIN, 0});
  if (poll(polled.data(), polled.size(), MillisecondsUntil(NextDue())) <= 0) return;
  const auto is_ready = [&polled](size_t i) { return polled[i].revents != 0; };
  is_stopping_ = is_ready(0);
  registry_changed_ = registry_changed_ || is_ready(2);
  for (size_t i = disturbances; i < changes; ++i) disturbed_ = disturbed_ || is_ready(i);
  for (size_t i = changes; i < polled.size(); ++i) {
    if (is_ready(i)) read_at_ = std::min(read_at_, SteadyClock::now() + options_.batch);
  }
}

void Notifier::RunTasks() {
  uint64_t count = 0;
  if (read(wake_.Get(), &count, sizeof(count)) != sizeof(count)) return;
  std::vector<Task> tasks;
  {
    const std::lock_guard guard(mutex_);
    tasks.swap(tasks_);
  }
  for (const Task& task : tasks) task();
}

void Notifier::DoWhatIsDue() {
  const TimePoint now = SteadyClock::now();
  if (registry_changed_ || now >= examine_at_) ReadRegistry();
  if (now >= scan_at_) {
    watches_.Scan();
    scan_at_ = now + options_.scan_interval;
  }
  expire_at_ = syncs_.Expire(now, SyncState());
}

void Notifier::ReadRegistry() {
  registry_changed_ = false;
  registry_watch_.Rearm();
  registry_ = options_.read_registry();
  const std::set<std::string> problems(registry_.problems.begin(), registry_.problems.end());
  for (const std::string& problem : problems) {
    if (logged_problems_.count(problem) == 0) Log(LOG_ERR, "%s", problem.c_str());
  }
  logged_problems_ = problems;
  router_.SetQueues(registry_.Queues());
  watches_.Follow(registry_.list);
  AfterExamination();
}

void Notifier::AfterExamination() {
  disturbed_ = false;
  has_work_ = true;
  examine_at_ = SteadyClock::now() + (watches_.IsWaiting() ? kExamineIntervalWaiting : kExamineInterval);
}

void Notifier::ReadChanges() {
  const uint64_t before = changes_;
  for (size_t way = 0; way < watches_.Ways(); ++way) {
    if (watches_.Read(way)) syncs_.Drained(way);
  }
  has_work_ = true;
  const bool is_busy = changes_ - before >= kBusyChanges;
  read_at_ = is_busy ? SteadyClock::now() : TimePoint::max();
}

void Notifier::BeginSync() {
  ReadRegistry();
  sync_problems_.clear();
  watches_.Scan();
  syncs_.Begin();
  for (size_t way = 0; way < watches_.Ways(); ++way) {
    // A watcher that is still being set up may miss its cookie, or come to refuse what it is used for; but what it
    // covers is compared then, which says all.
    if (!watches_.IsCovering(way)) continue;
    if (options_.cookies[way].Touch()) {
      syncs_.Touched(way);
    } else {
      sync_problems_.push_back("changes may be on their way: " + options_.cookies[way].Path() +
                               " cannot be changed: " + ErrnoText());
    }
  }
}

void Notifier::ContinueSync() {
  if (watches_.IsSettingUp()) return;
  for (const size_t way : syncs_.Outstanding()) {
    if (!watches_.IsCovering(way)) syncs_.Reported(way);  // it watches nothing any more
  }
  if (!syncs_.Outstanding().empty()) return;
  const std::string held = router_.FlushAll(SteadyClock::now());
  if (!held.empty()) sync_problems_.push_back(held);
  for (const auto& problems : {registry_.problems, watches_.Problems()}) {
    sync_problems_.insert(sync_problems_.end(), problems.begin(), problems.end());
  }
  syncs_.End(sync_problems_);
}

/// What a sync waits for.
std::string Notifier::SyncState() const {
  std::string state;
  for (const size_t way : syncs_.Outstanding()) state += (state.empty() ? "" : ", ") + watches_.NameOf(way);
  if (!state.empty()) return "changes are still being read (" + state + ")";
  if (watches_.IsSettingUp()) return "folders are still being set up to be watched";
  return "the notification daemon is busy";
}

void Notifier::OnChange(Change change) {
  ++changes_;
  if (IsOwn(change.path) && (change.old_path.empty() || IsOwn(change.old_path))) return;
  router_.Put(change, SteadyClock::now());
}

void Notifier::OnCompare(const std::string& path) { router_.PutComparison(path); }

void Notifier::OnLost(size_t way) {
  ++lost_;
  Log(LOG_WARNING, "the kernel dropped changes (%s); what it was to report is compared with the disk",
      watches_.NameOf(way).c_str());
  syncs_.Lost(way);
}

void Notifier::OnCookie(size_t way) { syncs_.Reported(way); }

bool Notifier::IsOwn(const std::string& path) const {
  return std::any_of(options_.own_paths.begin(), options_.own_paths.end(),
                     [&path](const std::string& own) { return path.compare(0, own.size(), own) == 0; });
}

NotifierStatus Notifier::MakeStatus() const {
  NotifierStatus status;
  const std::map<std::string, QueueFigures> figures = router_.Figures();
  for (const Registration& registration : registry_.list) {
    QueueStatus queue = {registration.queue, registration.application, {}, {}};
    for (const QueueWatch& watch : registration.watches) queue.watches.push_back({watch.path, watches_.StateOf(watch)});
    if (const auto found = figures.find(registration.queue); found != figures.end()) queue.figures = found->second;
    status.queues.push_back(std::move(queue));
  }
  status.changes = changes_;
  status.lost = lost_;
  for (const auto& problems : {options_.problems, registry_.problems, watches_.Problems()}) {
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
    expire_at_ = std::min(expire_at_, deadline);
  });
  promise.reset();
  SyncRounds::Outcome outcome = Await(std::move(future), timeout + kStatusTimeout, "the notification daemon is busy");
  if (!outcome.failure.empty()) throw Error(Error::kInternal, outcome.failure);
  return std::move(outcome.problems);
}

NotifierStatus Notifier::Status() {
  auto promise = std::make_shared<std::promise<NotifierStatus>>();
  std::future<NotifierStatus> future = promise->get_future();
  Post([this, promise] { promise->set_value(MakeStatus()); });
  promise.reset();
  return Await(std::move(future), kStatusTimeout, "the notification daemon is busy");
}

void Notifier::Post(Task task) {
  {
    const std::lock_guard guard(mutex_);
    if (is_closed_) throw Error(Error::kInternal, kStopping);
    tasks_.push_back(std::move(task));
  }
  const uint64_t one = 1;
  (void)!write(wake_.Get(), &one, sizeof(one));
}

/// Drops what was asked for: whoever waits is told.
void Notifier::Close() {
  std::vector<Task> tasks;
  const std::lock_guard guard(mutex_);
  is_closed_ = true;
  tasks.swap(tasks_);
  syncs_ = SyncRounds(watches_.Ways());
}

}  // namespace ferrox::notifyd
