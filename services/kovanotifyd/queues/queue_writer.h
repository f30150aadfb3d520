#pragma once

#include <chrono>
#include <cstdint>
#include <set>
#include <string>

#include "services/kovanotifyd/queues/queue_outbox.h"

namespace ferrox::fileindex {
class LockedQueue;
}

namespace ferrox::notifyd {

/// What people can see of one queue.
struct QueueFigures {
  uint64_t written = 0;          ///< lines appended since the daemon started
  uint64_t held = 0;             ///< lines in memory that could not be appended yet
  int64_t held_since = 0;        ///< when the oldest of them was added, seconds since the epoch; 0 without
  std::string held_reason = {};  ///< why, in a sentence; "" without
};

/// One queue's file and the lines that wait to be appended to it. When the file cannot take them (full disk, lock held
/// by another process, folder missing, file at its limit), they stay in memory and are tried again after pauses that
/// double from 0.1 s to 5 s. Belongs to one thread.
class QueueWriter {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  struct Limits {
    uint64_t lines = 0;  ///< in memory
    uint64_t bytes = 0;  ///< of the file, which is not appended to once it has that many
  };

  QueueWriter(std::string path, const Limits& limits);

  const std::string& Path() const { return path_; }

  // Adding lines. Nothing is written before Flush or FlushAll, but for changes of rights, of which so many come at once
  // that they would have to be replaced by comparisons.

  /// As QueueOutbox::Add.
  void Add(uint32_t event, const WatchedName& name, uint32_t mask);
  void AddRename(const WatchedName& old_name, const WatchedName& name);
  /// Asks for a comparison of disk and index at and below the folder.
  void AddComparison(const WatchedName& folder);
  /// Reports a change of the file with that number, under a name that the queue does not have. Beyond some thousand
  /// such files `watched`, a folder that the queue watches, is compared instead.
  void AddFile(uint64_t file, const std::string& watched);
  /// As QueueOutbox::CoversContentOf.
  bool CoversContentOf(std::string_view path) const { return outbox_.CoversContentOf(path); }

  /// Appends what waits, unless the pause after a failed attempt is not over. Does not wait for the lock.
  /// @return when the next attempt is due; TimePoint::max() when nothing waits any more.
  TimePoint Flush(TimePoint now);
  /// Appends what waits, whatever pause is under way. Another process holds the lock for a moment while it detaches the
  /// queue: up to 0.1 s are spent on getting it.
  /// @return "", or why not everything could be appended.
  std::string FlushAll(TimePoint now);

  QueueFigures Figures() const;

 private:
  size_t Waiting() const { return outbox_.Size() + (files_.empty() ? 0 : 1); }
  void NoteArrival();
  std::string Append();
  std::string AppendTo(const fileindex::LockedQueue& queue);
  std::string AppendFilesTo(const fileindex::LockedQueue& queue);
  void NoteOutcome(std::string reason, TimePoint now);

  std::string path_;
  uint64_t bytes_max_;
  size_t lines_max_;
  QueueOutbox outbox_;
  std::set<uint64_t> files_ = {};  ///< numbers of changed files, for one line together,
  std::string files_folder_ = {};  ///< whose path is this watched folder
  int64_t oldest_ = 0;             ///< when the oldest waiting line was added, seconds since the epoch; 0 without
  uint64_t written_ = 0;
  std::string reason_;                  ///< why the last attempt failed; "" when it succeeded
  std::chrono::milliseconds pause_{0};  ///< after the last failed attempt; 0 when it succeeded
  TimePoint next_attempt_ = TimePoint::min();
};

}  // namespace ferrox::notifyd
