#include "services/kovanotifyd/queues/queue_writer.h"

#include <sys/stat.h>
#include <syslog.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <utility>

#include <kova/lock_holder.h>

#include "common/clock.h"
#include "common/log.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_file.h"
#include "fileindex/queue/queue_line.h"

namespace ferrox::notifyd {

namespace {

using std::chrono::milliseconds;

constexpr milliseconds kFirstPause{100};
constexpr milliseconds kLongestPause{5000};
/// A failure is logged once attempts have failed until the pause is this long: not one that a moment mends.
constexpr milliseconds kLoggedPause{1600};
/// As many numbers as one line of a queue can hold. More come at once only when a whole tree has second names.
constexpr size_t kFilesMax = 5000;
/// Of lines that are formatted and written together. Bounds memory.
constexpr size_t kBytesAtOnce = 1U << 20;
constexpr char kLockHeld[] = "its lock is held elsewhere";
/// FlushAll spends at most 20 times 5 ms on the lock.
constexpr int kLockAttempts = 20;
constexpr milliseconds kLockPause{5};

}  // namespace

QueueWriter::QueueWriter(std::string path, const Limits& limits)
    : path_(std::move(path)),
      bytes_max_(limits.bytes),
      lines_max_(static_cast<size_t>(std::min<uint64_t>(limits.lines, SIZE_MAX))),
      outbox_(lines_max_) {}

void QueueWriter::NoteArrival() {
  if (oldest_ == 0 && Waiting() > 0) oldest_ = Clock::Get().Now();
}

void QueueWriter::Add(uint32_t event, const WatchedName& name, uint32_t mask) {
  outbox_.Add(event, name, mask);
  NoteArrival();
  // Before they would be replaced by comparisons, which nobody carries out ahead of a long pass.
  const bool are_many_rights = event == fileindex::EVENT_ATTR && outbox_.Size() >= lines_max_ / 2;
  if (are_many_rights && reason_.empty()) NoteOutcome(Append(), std::chrono::steady_clock::now());
}

void QueueWriter::AddRename(const WatchedName& old_name, const WatchedName& name) {
  outbox_.AddRename(old_name, name);
  NoteArrival();
}

void QueueWriter::AddComparison(const WatchedName& folder) {
  Add(fileindex::EVENT_REINDEX, folder, fileindex::EVENT_REINDEX);
}

void QueueWriter::AddFile(uint64_t file, const std::string& watched) {
  if (files_.size() >= kFilesMax && files_.count(file) == 0) {
    return AddComparison({watched, true, watched == "/" ? 0 : watched.size()});
  }
  files_.insert(file);
  files_folder_ = watched;
  NoteArrival();
}

QueueWriter::TimePoint QueueWriter::Flush(TimePoint now) {
  if (Waiting() == 0) return TimePoint::max();
  if (now >= next_attempt_) NoteOutcome(Append(), now);
  return Waiting() == 0 ? TimePoint::max() : next_attempt_;
}

std::string QueueWriter::FlushAll(TimePoint now) {
  std::string reason = Append();
  for (int attempt = 1; reason == kLockHeld && attempt < kLockAttempts; ++attempt) {
    Clock::Get().SleepFor(kLockPause);
    reason = Append();
  }
  NoteOutcome(reason, now);
  return reason;
}

/// Sets the pause until the next attempt; `reason` is "" after success. A failure that lasts is logged once, and so is
/// its end.
void QueueWriter::NoteOutcome(std::string reason, TimePoint now) {
  if (reason.empty()) {
    if (pause_ >= kLoggedPause) Log(LOG_NOTICE, "queue %s takes changes again", path_.c_str());
    pause_ = milliseconds(0);
    next_attempt_ = TimePoint::min();
  } else {
    const bool was_logged = pause_ >= kLoggedPause;
    pause_ = std::clamp(2 * pause_, kFirstPause, kLongestPause);
    next_attempt_ = now + pause_;
    if (!was_logged && pause_ >= kLoggedPause) {
      const std::string holder = reason == kLockHeld ? kova::LockHolderText(path_) : std::string();
      Log(LOG_WARNING, "queue %s: changes are held in memory: %s%s", path_.c_str(), reason.c_str(),
          holder.empty() ? "" : (": " + holder).c_str());
    }
  }
  reason_ = std::move(reason);
}

/// One attempt. @return "", or why not everything could be appended.
std::string QueueWriter::Append() {
  if (Waiting() == 0) return {};
  struct stat status = {};
  if (lstat(path_.c_str(), &status) == 0 && static_cast<uint64_t>(status.st_size) >= bytes_max_) {
    return "it has grown to " + std::to_string(status.st_size >> 20) + " MiB and nobody empties it";
  }
  const auto queue = fileindex::LockedQueue::Try(path_);
  if (queue == nullptr) return errno == EWOULDBLOCK ? kLockHeld : "it cannot be opened: " + ErrnoText();
  return AppendTo(*queue);
}

/// Lines that were written are forgotten also when a later one fails.
std::string QueueWriter::AppendTo(const fileindex::LockedQueue& queue) {
  outbox_.DropCovered();
  std::string reason;
  std::string text;
  size_t done = 0;
  while (done < outbox_.Size()) {
    text.clear();
    const size_t count = outbox_.Format(done, kBytesAtOnce, text);
    if (!queue.Append(text)) {
      reason = "it cannot be written: " + ErrnoText();
      break;
    }
    done += count;
  }
  outbox_.RemoveFirst(done);
  written_ += done;
  if (reason.empty()) reason = AppendFilesTo(queue);
  if (Waiting() == 0) oldest_ = 0;
  return reason;
}

/// The line of all numbers goes behind the others: it tells nothing that they depend on.
std::string QueueWriter::AppendFilesTo(const fileindex::LockedQueue& queue) {
  if (files_.empty()) return {};
  std::string text;
  fileindex::AppendFilesLine(text, files_folder_, files_);
  if (!queue.Append(text)) return "it cannot be written: " + ErrnoText();
  files_.clear();
  ++written_;
  return {};
}

QueueFigures QueueWriter::Figures() const {
  QueueFigures figures;
  figures.written = written_;
  if (reason_.empty()) return figures;
  figures.held = Waiting();
  figures.held_since = oldest_;
  figures.held_reason = reason_;
  return figures;
}

}  // namespace ferrox::notifyd
