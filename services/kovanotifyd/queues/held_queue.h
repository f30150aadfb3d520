#pragma once

#include <chrono>
#include <cstdint>
#include <set>
#include <string>

#include "services/kovanotifyd/queues/queue_outbox.h"
#include "services/kovanotifyd/queues/queue_router.h"

namespace ferrox::notifyd {

/// One queue's file and the lines that wait for it. What cannot be appended is held and tried again, more and more
/// rarely.
class HeldQueue {
 public:
  using TimePoint = QueueRouter::TimePoint;

  HeldQueue(std::string path, const QueueRouter::Options& options);

  QueueOutbox& Outbox() { return outbox_; }
  const std::string& Path() const { return path_; }

  /// Appends what waits unless the next attempt is not due yet. @return when that is; TimePoint::max() when nothing
  /// waits any more.
  TimePoint Flush(TimePoint now);
  /// Appends what waits; takes the time of a few attempts when the lock is held elsewhere, as it is for a moment while
  /// the queue is detached. @return "", or why that failed.
  std::string FlushAll(TimePoint now);

  /// A file of that number changed under a name that the queue has nothing of. Of very many, `watched`, a folder of the
  /// queue, is compared instead.
  void NoteFile(uint64_t file, const std::string& watched);

  QueueFigures Figures() const;
  /// To be called after lines were put into the outbox.
  void NoteAge();

 private:
  size_t Waiting() const { return outbox_.Size() + (files_.empty() ? 0 : 1); }
  std::string Append();
  std::string AppendLocked();
  std::string AppendFiles();
  void Hold(std::string reason, TimePoint now);

  std::string path_;
  uint64_t bytes_max_;
  QueueOutbox outbox_;
  std::set<uint64_t> files_ = {};  // to be told by their numbers, in one line,
  std::string files_folder_ = {};  // of this watched folder
  int64_t oldest_ = 0;             // when the oldest of what waits came, seconds since the epoch
  uint64_t written_ = 0;
  std::string reason_;  // why the last attempt failed; "" when it did not
  std::chrono::milliseconds pause_{0};
  TimePoint next_attempt_ = TimePoint::min();
};

}  // namespace ferrox::notifyd
