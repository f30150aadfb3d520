#include "services/fileindexd/share_worker.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>
#include <vector>

#include "base/path.h"
#include "base/unique_fd.h"
#include "common/clock.h"
#include "common/error.h"
#include "common/file_util.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "common/paths.h"
#include "fileindex/optree/optree.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/queue/queue_mgr.h"
#include "fileindex/status_mgr.h"
#include "fileindex/util.h"
#include "sdk/share.h"
#include "services/fileindexd/operation_runner.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/queue_tail.h"
#include "services/fileindexd/stray_documents.h"
#include "services/support/settings_problem.h"

namespace ferrox::indexd {

namespace {

using fileindex::StatusMgr;
using std::chrono::milliseconds;
using std::chrono::seconds;
using std::chrono::steady_clock;

/// The queue is looked at again after so long, whether or not it was seen to change.
constexpr seconds kSlowTimer(30);
constexpr seconds kSlowTimerWithoutWatch(2);
constexpr milliseconds kEventPoll(200);
/// Asks for nothing but a pass, which sees to what differs from the last one.
constexpr int kPassEvent = 0;
/// A worker that is to end waits so long for what it has asked of another daemon.
constexpr milliseconds kAnswerGrace(1000);
constexpr int kClearedByReindex = StatusMgr::kNeedReindex | StatusMgr::kSecondCondition;

bool HasContent(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode) && status.st_size > 0;
}

/// The lines of a queue file; of a long one, as many as its beginning lets expect.
uint64_t CountLines(const std::string& path) {
  const base::UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  struct stat status = {};
  if (!file.Valid() || fstat(file.Get(), &status) != 0 || status.st_size == 0) return 0;
  std::string begin(size_t{1} << 20, '\0');
  const ssize_t size = read(file.Get(), begin.data(), begin.size());
  if (size <= 0) return 0;
  const auto lines = static_cast<double>(std::count(begin.begin(), begin.begin() + size, '\n'));
  return static_cast<uint64_t>(lines * static_cast<double>(status.st_size) / static_cast<double>(size));
}

/// When the first of the queue files was made, which is when its oldest change happened; 0 without a queue.
int64_t OldestChange(const std::vector<std::string>& queue_files) {
  int64_t oldest = 0;
  for (const std::string& path : queue_files) {
    struct statx status = {};
    if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, STATX_BTIME | STATX_MTIME | STATX_SIZE, &status) != 0 ||
        status.stx_size == 0) {
      continue;
    }
    const int64_t made = (status.stx_mask & STATX_BTIME) != 0 ? status.stx_btime.tv_sec : status.stx_mtime.tv_sec;
    oldest = oldest == 0 ? made : std::min(oldest, made);
  }
  return oldest;
}

bool IsOutOfSpace(const Error& error, const std::string& share) {
  if (error.Code() == Error::kSpaceNotEnough) return true;
  return error.Code() == Error::kEngineStorage && !sdk::SDKShare(share).IsSpaceEnough();
}

}  // namespace

bool PauseState::Paused() const {
  const int64_t resume_time = resume_time_;
  return resume_time == 0 || (resume_time > 0 && Clock::Get().Now() < resume_time);
}

milliseconds PauseState::Left() const {
  const int64_t resume_time = resume_time_;
  if (resume_time == 0) return std::chrono::hours(1);
  return seconds(std::clamp<int64_t>(resume_time - Clock::Get().Now(), 0, 3600));
}

ShareWorker::ShareWorker(const std::string& share, const Environment& environment)
    : share_(share),
      root_(sdk::SDKShare(share).GetPath()),
      queue_path_(sdk::SDKShare(share).GetQueuePath()),
      environment_(environment),
      index_(environment.open_index(share)),
      applied_(fileindex::AppliedFoldersPath(queue_path_)),
      watch_({queue_path_}) {}

void ShareWorker::Start() {
  thread_ = std::thread([this] {
    Loop();
    end_.set_value();
  });
}

void ShareWorker::RequestStop() {
  if (stopping_.exchange(true)) return;
  stop_requested_ = steady_clock::now();
  progress_.End("its indexing was just ended or begun anew; ask again");
  Wake();
}

bool ShareWorker::StopWithin(milliseconds patience) {
  RequestStop();
  if (!thread_.joinable()) return true;
  const auto end = steady_clock::now() + patience;
  if (ended_.wait_until(std::min(end, stop_requested_ + kAnswerGrace)) != std::future_status::ready) {
    interruption_.CutWaits();
    if (ended_.wait_until(end) != std::future_status::ready) return false;
  }
  thread_.join();
  return true;
}

void ShareWorker::Stop() {
  while (!StopWithin(std::chrono::hours(1))) {
  }
}

void ShareWorker::Forget() {
  Stop();
  applied_.Forget();
}

void ShareWorker::Wake() {
  if (stopping_ || environment_.pause.Paused()) interruption_.Request();
  watch_.Wake();
}

void ShareWorker::SetInnerShares(const std::vector<std::string>& folders) {
  if (noted_inner_ == folders) return;
  const bool is_change = noted_inner_.has_value();
  noted_inner_ = folders;
  if (!is_change) return;  // the first round sees it
  ++inner_changes_;
  Wake();
}

void ShareWorker::CheckIndex() {
  look_at_index_ = true;
  Wake();
}

uint64_t ShareWorker::RequestSync() {
  if (NothingWaits()) return 0;
  const uint64_t request = progress_.Add();
  Wake();
  return request;
}

std::string ShareWorker::AwaitSync(uint64_t request, QueueProgress::TimePoint end) {
  std::string reason;
  switch (progress_.Wait(request, end, reason)) {
    case QueueProgress::Result::kDone:
      return "";
    case QueueProgress::Result::kFailed:
      return "share " + share_ + ": " + reason;
    case QueueProgress::Result::kTimeout:
      break;
  }
  return "share " + share_ +
         ": its changes are still being indexed; give more time, 'fileindexctl status' shows how far it is";
}

/// In this order: what leaves the live queue is in the detached one until the index has it.
bool ShareWorker::NothingWaits() const {
  if (!settled_ || look_at_index_ || inner_changes_ != inner_changes_seen_ || HasContent(queue_path_) ||
      IsFileExist(fileindex::DetachedQueuePath(queue_path_)))
    return false;
  try {
    return (StatusMgr().GetShareStatus(share_) & StatusMgr::kNeedReindex) == 0;
  } catch (const Error&) {
    return false;  // the worker tells why
  }
}

void ShareWorker::Loop() {
  const InterruptionScope scope(interruption_);
  while (!stopping_) {
    if (environment_.pause.Paused()) {
      status_.SetState(ShareStatus::State::kPaused);
      progress_.Failed(progress_.Last(), "indexing is paused; 'fileindexctl resume' resumes it");
      watch_.WaitForWake(environment_.pause.Left());
      continue;
    }
    interruption_.Clear();
    if (stopping_ || environment_.pause.Paused()) continue;
    const milliseconds wait = Round();
    if (stopping_ || environment_.pause.Paused()) continue;
    if (delay_.count() > 0) {
      watch_.WaitForWake(wait);
    } else {
      watch_.Wait(wait);
    }
  }
}

milliseconds ShareWorker::Round() {
  settled_ = false;
  inner_changes_seen_ = inner_changes_.load();
  serves_ = progress_.Last();
  try {
    RunOnce();
    delay_ = milliseconds(0);
    last_failure_ = 0;
    told_no_space_ = false;
    if (AwaitsEvent()) {
      status_.SetState(ShareStatus::State::kStarting, "the index is from before a change that is yet to be told");
      return kEventPoll;
    }
    settled_ = true;
    progress_.Done(serves_);
    status_.SetState(ShareStatus::State::kIdle);
    return watch_.SeesChanges() ? kSlowTimer : kSlowTimerWithoutWatch;
  } catch (const Interrupted&) {
    status_.EndPass();
    return milliseconds(0);
  } catch (const Error& error) {
    status_.EndPass();
    return stopping_ ? milliseconds(0) : OnFailure(error);
  } catch (const std::exception& error) {
    status_.EndPass();
    Log(LOG_ERR, "share %s: unexpected failure: %s", share_.c_str(), error.what());
    Tell(ShareStatus::State::kError, error.what());
    return NextDelay(seconds(10), seconds(300));
  }
}

milliseconds ShareWorker::OnFailure(const Error& error) {
  if (std::exchange(last_failure_, error.Code()) != error.Code()) {
    delay_ = milliseconds(0);
    failing_since_ = steady_clock::now();
  }
  index_exists_ = index_exists_ && error.Code() != Error::kEngineNoSuchIndex;
  look_at_index_ = true;
  try {
    if (IsOutOfSpace(error, share_)) return OnNoSpace(error);
  } catch (const Error&) {
    // The share is gone: said below, as the failure that it led to.
  }
  if (away_ && error.Code() == Error::kPathNotIndexable) {
    Tell(ShareStatus::State::kWaitingForVolume, error.what());
    return delay_ = environment_.volume_poll;
  }
  if (error.Code() == Error::kEngineUnreachable) {
    Tell(ShareStatus::State::kWaitingForEngine, "the search engine does not answer; start it with 'fileindexctl up'");
    return NextDelay(seconds(1), seconds(30));
  }
  if (error.Code() == Error::kParseFailed) {
    Tell(ShareStatus::State::kWaitingForContent, error.what());
    return NextDelay(seconds(1), seconds(30));
  }
  if (error.Code() == Error::kEngineIndexPaused) return OnIndexPaused();
  if (error.Code() == Error::kEngineNoSuchIndex) {
    status_.SetState(ShareStatus::State::kWaitingForEngine, error.what());
    return NextDelay(milliseconds(500), seconds(2));
  }
  if (error.Code() == Error::kEngineStorage && delay_.count() == 0) {
    // An engine that was killed says once that what it had not committed has to be sent again.
    status_.SetState(ShareStatus::State::kWaitingForEngine, error.what());
    return NextDelay(milliseconds(100), seconds(2));
  }
  const std::string detail = services::Describe(error);
  if (delay_.count() == 0) Log(LOG_ERR, "share %s: %s", share_.c_str(), detail.c_str());
  Tell(ShareStatus::State::kError, detail);
  return NextDelay(seconds(2), seconds(300));
}

/// For people, and for those who wait for the share's changes.
void ShareWorker::Tell(ShareStatus::State state, const std::string& detail) {
  status_.SetState(state, detail);
  progress_.Failed(serves_, detail);
}

/// The share is marked as needing a reindex, so that whatever the full disk swallowed is found again.
milliseconds ShareWorker::OnNoSpace(const Error& error) {
  Tell(ShareStatus::State::kWaitingForSpace,
       "less than 100 MiB are free; indexing goes on by itself when there is more");
  if (!told_no_space_) {
    told_no_space_ = true;
    Log(LOG_ERR, "share %s: no space for its index: %s", share_.c_str(), error.what());
    fileindex::SendZEMNotify();
    try {
      StatusMgr().SetShareStatus(share_, StatusMgr::kNeedReindex);
    } catch (const Error&) {
      told_no_space_ = false;  // the disk may be too full even for that; the next round tries again
    }
  }
  return NextDelay(seconds(10), seconds(300));
}

/// Where no folder of the share is paused, those that were have been removed, or a pause was not finished.
milliseconds ShareWorker::OnIndexPaused() {
  Tell(ShareStatus::State::kPaused, "the share's index is paused; 'fileindexctl share resume' resumes it");
  try {
    if (HasFailedTooLong(Error::kEngineIndexPaused) && !LoadFolders().AnyPaused()) index_->Resume();
  } catch (const Error&) {
    // Tried again when the pause is met again.
  }
  return NextDelay(milliseconds(500), seconds(10));
}

bool ShareWorker::HasFailedTooLong(int code) const {
  const auto since = last_failure_ == code ? failing_since_ : steady_clock::now();
  return steady_clock::now() - since >= environment_.patience;
}

milliseconds ShareWorker::NextDelay(milliseconds first, milliseconds last) {
  delay_ = std::clamp(2 * delay_, first, last);
  return delay_;
}

void ShareWorker::RunOnce() {
  CheckShare();
  // Nobody may have noticed what became of it meanwhile.
  if (away_) (void)Queue(fileindex::EVENT_REINDEX, root_);
  away_ = false;
  const ShareFolders folders = LoadFolders();
  EnsureIndex();
  if (look_at_index_.exchange(false)) FollowRebuilding();
  const std::string detached = fileindex::DetachedQueuePath(queue_path_);
  // A pass looks at the folders of shares in this one that came or went; nobody queues anything for that.
  const bool is_queued = HasContent(queue_path_) || IsFileExist(detached);
  if (!is_queued && folders.DiffersInInnerAlone(applied_.Get())) (void)Queue(kPassEvent, root_);
  do {
    serves_ = progress_.Last();
    QueueNeededReindex();
    const bool begun_before = IsFileExist(detached);
    if (!begun_before && !HasContent(queue_path_)) break;
    if (!begun_before) Gather();
    RunPass();
    if (!begun_before) progress_.Done(serves_);
  } while (true);
  FinishRebuilding();
}

/// A change after a quiet time goes at once; under load, passes come at this distance and so grow with it. Nobody who
/// waits for the queue waits for that.
void ShareWorker::Gather() {
  const auto left = std::chrono::ceil<milliseconds>(last_pass_end_ + environment_.gather_time - steady_clock::now());
  if (left.count() > 0 && !progress_.HasPending()) watch_.WaitForWake(left);
  interruption_.Check();
  serves_ = progress_.Last();
}

void ShareWorker::CheckShare() {
  const sdk::SDKShare share(share_);
  FERROX_FAIL_IF(share.GetPath() != root_, Error::kNoSuchShare, "the share's folder is another one now");
  const std::string absence = AbsenceOf(root_, applied_.MountPoint(), environment_.is_mount_point);
  away_ = away_ || !absence.empty();
  FERROX_FAIL_IF(!absence.empty(), Error::kPathNotIndexable, absence);
  FERROX_FAIL_IF(told_no_space_ && !share.IsSpaceEnough(), Error::kSpaceNotEnough, "still less than 100 MiB free");
  const std::string problem = ShareProblem(share_, root_);
  FERROX_FAIL_IF(!problem.empty(), Error::kPathNotIndexable, problem);
}

/// Who adds and removes folders makes and removes the index. Only a lost one is made here, after a while: an index that
/// is missing may be about to be renamed to this name, or to be gone for good, with its last folder.
void ShareWorker::EnsureIndex() {
  if (index_exists_) return;
  if (!index_->Exists()) {
    FERROX_FAIL_IF(!HasFailedTooLong(Error::kEngineNoSuchIndex), Error::kEngineNoSuchIndex,
                   "the share has no index yet");
    MakeMissingIndex();
  }
  if (index_->List("", "", 1).empty()) applied_.Forget();
  index_exists_ = true;
}

/// An index that the engine has made anew holds nothing that the folders want. What it got before this process began is
/// found in it and not read again.
void ShareWorker::FollowRebuilding() {
  const int64_t before = rebuilding_.exchange(index_->Rebuilding());
  if (rebuilding_ == 0 || rebuilding_ == before) return;
  Log(LOG_WARNING, "the index of share %s was made anew; it is filled again", share_.c_str());
  applied_.Set(ShareFolders(), applied_.MountPoint());
  (void)Queue(fileindex::EVENT_REINDEX, root_);
}

/// Once a pass has brought the index in line with the folders.
void ShareWorker::FinishRebuilding() {
  if (rebuilding_ == 0 || applied_.Get().Count() == 0) return;
  if (!LoadFolders().DifferingFrom(applied_.Get()).empty()) return;
  index_->EndRebuilding(rebuilding_);
  rebuilding_ = 0;
  look_at_index_ = true;  // another may have begun meanwhile
  watch_.Wake();
}

/// The folders are looked at under their lock, so that no index is made for a share whose last folder is being removed.
/// A new index has nothing in it: the reindex that fills it is queued before the index exists, so that a crash in
/// between leaves no empty index that looks finished.
void ShareWorker::MakeMissingIndex() {
  const LockFile lock(InstancePath(kFolderLockPath), true);
  FERROX_FAIL_IF(LoadFolders().Count() == 0, Error::kEngineNoSuchIndex, "the share is not indexed any more");
  if (index_->Exists()) return;
  Log(LOG_WARNING, "the index of share %s is gone; it is made anew", share_.c_str());
  (void)Queue(fileindex::EVENT_REINDEX, root_);
  index_->Create();
}

/// Whether the index is not what the folders want, although the queue is empty. The event that tells of it may be yet
/// to come. If it does not, its sender has died or could not tell, and it is queued here.
bool ShareWorker::AwaitsEvent() {
  const ShareFolders folders = LoadFolders();
  const std::vector<std::string> differing = folders.DifferingFrom(applied_.Get());
  const bool strays = HoldsStrays();
  if (!strays && folders.DiffersInInnerAlone(applied_.Get())) return true;  // since this round began
  if (!strays && differing.empty()) {
    awaits_since_.reset();
    return false;
  }
  const auto now = steady_clock::now();
  if (!awaits_since_) awaits_since_ = now;
  if (now - *awaits_since_ < environment_.patience) return true;
  // The others are compared in the same pass.
  strays ? Queue(fileindex::EVENT_REINDEX, root_) : Queue(fileindex::EVENT_UPDATE_CFG, differing.front());
  return true;
}

/// Whether the index that this worker took over holds documents that no folder wants: those of before the share was
/// renamed or moved, for example.
bool ShareWorker::HoldsStrays() {
  strays_looked_for_ = strays_looked_for_ || FindStray(*index_, LoadFolders().Topmost(root_)).empty();
  return !strays_looked_for_;
}

/// Turns the share's mark into a queued reindex.
void ShareWorker::QueueNeededReindex() {
  if ((StatusMgr().GetShareStatus(share_) & StatusMgr::kNeedReindex) == 0) return;
  if (Queue(fileindex::EVENT_REINDEX, root_)) StatusMgr().UnsetShareStatus(share_, kClearedByReindex);
}

/// False when the queue holds a damaged line and takes no event: the share is then marked, and asked for again once
/// that queue has been worked off.
bool ShareWorker::Queue(int event, const std::string& path) {
  try {
    fileindex::AddCustomEvent(event, path, "", Json::Value());
    return true;
  } catch (const Error& error) {
    if (error.Code() != Error::kMalformedEvent && error.Code() != Error::kBadArgument) throw;
    return false;
  }
}

/// A writer is seen while it still holds the lock of the queue, for an instant; the detaching would try again only
/// after some tenths of a second.
void ShareWorker::AwaitFreeQueue() {
  constexpr int kAttempts = 200;
  for (int i = 0; i < kAttempts && HasContent(queue_path_); ++i) {
    if (LockFile::Try(queue_path_, true) != nullptr || errno != EWOULDBLOCK) return;
    interruption_.SleepFor(milliseconds(1));
  }
}

void ShareWorker::RunPass() {
  const HeldFolder held(root_);
  const std::string mount_point = MountPointOf(root_, environment_.is_mount_point);
  CheckShare();
  fileindex::QueueMgr queue(queue_path_);
  AwaitFreeQueue();
  if (!queue.PrepareTmpQueue() && !IsFileExist(fileindex::DetachedQueuePath(queue_path_))) return;
  // Only now: of folders that are changed later, the events are in a later queue.
  const ShareFolders folders = LoadFolders();
  const std::set<uint64_t> changed_files = ChangedNumbersIn(fileindex::DetachedQueuePath(queue_path_));
  OperationRunner runner({share_, root_, folders, *index_, environment_.pool, interruption_, status_, held, queue_path_,
                          environment_.keep_up_interval, changed_files, !strays_looked_for_, applied_.Get(),
                          [&] { AwaitOtherFolders(folders); }, written_ahead_});
  RunOperations(queue, runner, folders, changed_files.size() > kChangedNumbersMax);
  // What went away in the meantime, with its volume for example, looked as if it had been deleted.
  runner.CheckRoot();
  CheckShare();
  QueueAgainIfChanged(runner, folders);
  queue.DeleteTmp();
  // While the queue was still there, a change made since may have been taken for one that it covers.
  QueueAgainIfChanged(runner, folders);
  applied_.Set(folders, mount_point);
  status_.EndPass();
  last_pass_end_ = steady_clock::now();
}

void ShareWorker::AwaitOtherFolders(const ShareFolders& folders) {
  const auto end = steady_clock::now() + environment_.patience;
  while (steady_clock::now() < end) {
    if (!AreStill(folders)) throw Interrupted();
    interruption_.SleepFor(kEventPoll);
  }
}

/// Where the folders differ from those that the index is in line with is compared, too: a reindex that waits in the
/// queue swallows the event of a folder, or of a user, that was renamed into its place, and so what is to be done at
/// the old one.
void ShareWorker::RunOperations(fileindex::QueueMgr& queue, OperationRunner& runner, const ShareFolders& folders,
                                bool whole_share) {
  const auto each = [&queue](const std::function<void(const fileindex::OP&)>& take) {
    (void)queue.ProcessOP([&take](const std::shared_ptr<fileindex::OP>& op) { take(*op); }, true);
  };
  std::vector<std::string> also_compare = folders.DifferingFrom(applied_.Get());
  if (whole_share) also_compare.push_back(root_);
  try {
    runner.Run(each, also_compare);
  } catch (const Interrupted&) {
    runner.KeepWhatIsDone();
    throw;
  }
}

ShareFolders ShareWorker::LoadFolders() {
  ShareFolders folders = ShareFolders::Load(share_, root_);
  const base::MutexLock lock(shown_mutex_);
  shown_ = std::make_shared<const ShareFolders>(folders);
  return folders;
}

/// The library queues nothing below a path whose reindex it sees in the queue, although the folders of this pass may be
/// those of before the change. The mark is on the disk before the queue is gone.
void ShareWorker::QueueAgainIfChanged(const OperationRunner& runner, const ShareFolders& folders) {
  if (!runner.HadReindex() || AreStill(folders)) return;
  StatusMgr().SetShareStatus(share_, StatusMgr::kNeedReindex);
}

bool ShareWorker::AreStill(const ShareFolders& folders) {
  try {
    return LoadFolders() == folders;
  } catch (const Error&) {
    return false;  // what cannot be told counts as changed
  }
}

std::shared_ptr<const ShareFolders> ShareWorker::Shown() {
  const base::MutexLock lock(shown_mutex_);
  return shown_;
}

/// An encrypted share is a mount of its own, and takes those below it for its own too.
std::vector<std::string> ShareWorker::MountsLeftOut() const {
  try {
    return sdk::SDKShare(share_).IsEncryption() ? std::vector<std::string>{} : environment_.mounts_below(root_);
  } catch (const Error&) {
    return {};  // the share is gone
  }
}

/// The folders under indexed ones that are not indexed here, for reasons that only the configuration and the mounts
/// tell. Of those that lie in each other, the outermost.
Json::Value ShareWorker::LeftOut(const ShareFolders& folders) const {
  Json::Value list(Json::arrayValue);
  std::string last;
  const auto is_new = [&last](const std::string& path) {
    if (!last.empty() && base::IsBelow(path, last)) return false;
    last = path;
    return true;
  };
  for (const auto& [path, share] : folders.Inner()) {
    if (!is_new(path)) continue;
    Json::Value& entry = list.append(Json::Value());
    entry["path"] = path;
    entry["share"] = share;
    entry["reason"] = "its files are those of share " + share;
  }
  last.clear();
  for (const std::string& point : MountsLeftOut()) {
    if (folders.PlaceOf(point) == ShareFolders::Place::kOutside || !is_new(point)) continue;
    Json::Value& entry = list.append(Json::Value());
    entry["path"] = point;
    entry["reason"] = "another file system is mounted there; 'fileindexctl share add' makes it a share of its own";
  }
  return list;
}

Json::Value ShareWorker::Status(std::chrono::milliseconds engine_wait) {
  Json::Value json = status_.ToJson();
  json["share"] = share_;
  json["path"] = root_;
  const std::shared_ptr<const ShareFolders> folders = Shown();
  json["folders"] = Json::UInt64(folders == nullptr ? 0 : folders->Count());
  if (folders != nullptr) json["left_out"] = LeftOut(*folders);
  json["queue"] = queue_path_;
  // The worker may not have noticed yet that the pause is over.
  const bool pause_over = json["state"] == "paused" && !json.isMember("detail") && !environment_.pause.Paused();
  if (pause_over) json["state"] = "starting";
  const uint64_t operations = json["operations"].asUInt64();
  const uint64_t detached = operations != 0 ? operations - json["operations_done"].asUInt64()
                                            : CountLines(fileindex::DetachedQueuePath(queue_path_));
  json["queued"] = Json::UInt64(detached + CountLines(queue_path_));
  const int64_t oldest = OldestChange({fileindex::DetachedQueuePath(queue_path_), queue_path_});
  if (oldest > 0) json["oldest_change"] = Json::Int64(oldest);
  json["index"] = index_->Figures(engine_wait);
  const Json::Value& index = json["index"];
  if (index.isObject() && index.isMember("rebuilding") && index["rebuilding"]["since"] != Json::Int64(rebuilding_)) {
    CheckIndex();
  }
  return json;
}

}  // namespace ferrox::indexd
