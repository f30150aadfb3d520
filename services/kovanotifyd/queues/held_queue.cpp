#include "services/kovanotifyd/queues/held_queue.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <utility>

#include <kova/lock_holder.h>

#include "common/clock.h"
#include "common/line_file.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "fileindex/optree/optree.h"
#include "services/kovanotifyd/queues/queue_line.h"

namespace ferrox::notifyd {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kFirstPause{100};
constexpr milliseconds kLongestPause{5000};
constexpr milliseconds kTellingPause{1600};
/// As many numbers as a line can have, and more than are ever told but by a whole tree of links.
constexpr size_t kFilesMax = 5000;
constexpr size_t kBytesAtOnce = 1U << 20;
constexpr char kLockHeld[] = "its lock is held elsewhere";
constexpr int kLockAttempts = 20;
constexpr milliseconds kLockPause{5};

}  // namespace

HeldQueue::HeldQueue(std::string path, const QueueRouter::Options& options)
    : path_(std::move(path)),
      bytes_max_(options.queue_bytes_max),
      outbox_(static_cast<size_t>(std::min<uint64_t>(options.held_max, SIZE_MAX))) {}

void HeldQueue::NoteAge() {
  if (oldest_ == 0 && Waiting() > 0) oldest_ = Clock::Get().Now();
}

void HeldQueue::NoteFile(uint64_t file, const std::string& watched) {
  if (files_.size() < kFilesMax || files_.count(file) != 0) {
    files_.insert(file);
    files_folder_ = watched;
  } else {
    outbox_.Add(fileindex::EVENT_REINDEX, {watched, true, watched == "/" ? 0 : watched.size()},
                fileindex::EVENT_REINDEX);
  }
  NoteAge();
}

HeldQueue::TimePoint HeldQueue::Flush(TimePoint now) {
  if (Waiting() == 0) return TimePoint::max();
  if (now >= next_attempt_) Hold(Append(), now);
  return Waiting() == 0 ? TimePoint::max() : next_attempt_;
}

std::string HeldQueue::FlushAll(TimePoint now) {
  std::string reason = Append();
  for (int attempt = 1; reason == kLockHeld && attempt < kLockAttempts; ++attempt) {
    Clock::Get().SleepFor(kLockPause);
    reason = Append();
  }
  Hold(reason, now);
  return reason;
}

/// Takes note of how an attempt went, "" for well. What lasts is told in the log, once, and so is its end.
void HeldQueue::Hold(std::string reason, TimePoint now) {
  if (reason.empty()) {
    if (pause_ >= kTellingPause) Log(LOG_NOTICE, "queue %s takes changes again", path_.c_str());
    pause_ = milliseconds(0);
    next_attempt_ = TimePoint::min();
  } else {
    const bool was_told = pause_ >= kTellingPause;
    pause_ = std::clamp(2 * pause_, kFirstPause, kLongestPause);
    next_attempt_ = now + pause_;
    if (!was_told && pause_ >= kTellingPause) {
      const std::string holder = reason == kLockHeld ? kova::LockHolderText(path_) : std::string();
      Log(LOG_WARNING, "queue %s: changes are held in memory: %s%s", path_.c_str(), reason.c_str(),
          holder.empty() ? "" : (": " + holder).c_str());
    }
  }
  reason_ = std::move(reason);
}

/// @return "", or why not everything could be appended.
std::string HeldQueue::Append() {
  if (Waiting() == 0) return {};
  struct stat status = {};
  if (lstat(path_.c_str(), &status) == 0 && static_cast<uint64_t>(status.st_size) >= bytes_max_) {
    return "it has grown to " + std::to_string(status.st_size >> 20) + " MiB and nobody empties it";
  }
  const auto lock = LockFile::Try(path_, true);
  if (lock == nullptr) return errno == EWOULDBLOCK ? kLockHeld : "it cannot be opened: " + ErrnoText();
  return AppendLocked();
}

std::string HeldQueue::AppendLocked() {
  outbox_.Tidy();
  std::string reason;
  std::string text;
  size_t done = 0;
  while (done < outbox_.Size()) {
    text.clear();
    const size_t count = outbox_.Format(done, kBytesAtOnce, text);
    if (!AppendLines(path_, text)) {
      reason = "it cannot be written: " + ErrnoText();
      break;
    }
    done += count;
  }
  outbox_.RemoveFirst(done);
  written_ += done;
  if (reason.empty()) reason = AppendFiles();
  if (Waiting() == 0) oldest_ = 0;
  return reason;
}

std::string HeldQueue::AppendFiles() {
  if (files_.empty()) return {};
  std::string text;
  AppendFilesLine(text, files_folder_, files_);
  if (!AppendLines(path_, text)) return "it cannot be written: " + ErrnoText();
  files_.clear();
  ++written_;
  return {};
}

QueueFigures HeldQueue::Figures() const {
  QueueFigures figures;
  figures.written = written_;
  if (reason_.empty()) return figures;
  figures.held = Waiting();
  figures.held_since = oldest_;
  figures.held_reason = reason_;
  return figures;
}

}  // namespace ferrox::notifyd
