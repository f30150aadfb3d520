#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "services/kovanotifyd/change.h"

namespace ferrox::notifyd {

/// One folder that a queue wants to hear of, as it was registered (docs/formats/notifyd.md).
struct QueueWatch {
  std::string path;
  uint32_t mask = 0;
  std::vector<std::string> ignore = {};
};

/// What people can see of one queue.
struct QueueFigures {
  uint64_t written = 0;          ///< lines appended since the daemon started
  uint64_t held = 0;             ///< changes in memory that could not be appended yet
  int64_t held_since = 0;        ///< when the oldest of them happened, seconds since the epoch; 0 without
  std::string held_reason = {};  ///< why, in a sentence; "" without
};

/// Turns changes into lines of the queues that want to hear of them, and appends these. A change that lies in a watched
/// folder of several queues goes to each of them; a rename that crosses the border of what a queue watches is a create
/// or a delete for it. A file that is written to is reported when it is closed, or, still open, once it has been quiet,
/// or at the latest after a few seconds, and not for each write. Changes of one path that wait together are one.
/// Lines that cannot be appended (full disk, lock held elsewhere, a queue that nobody empties) are kept in memory in
/// few words: what grows beyond a bound becomes the comparison of a folder. Belongs to one thread. Nothing here blocks
/// longer than a write, but FlushAll.
class QueueRouter {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  struct Options {
    std::chrono::milliseconds quiet{500};     ///< of a file that stays open
    std::chrono::milliseconds longest{5000};  ///< what is written to all the time is reported so often
    uint64_t held_max = 20000;                ///< changes of one queue in memory
    uint64_t queue_bytes_max = 64U << 20;     ///< a queue that has grown to this is not appended to
  };

  explicit QueueRouter(const Options& options);
  QueueRouter(const QueueRouter&) = delete;
  QueueRouter& operator=(const QueueRouter&) = delete;
  ~QueueRouter();

  /// What each queue (by its path) wants to hear of from now on. Held lines of queues that stay are kept; those of
  /// queues that are gone are dropped.
  void SetQueues(const std::map<std::string, std::vector<QueueWatch>>& queues);

  /// Takes note of a change. Of a name in no watched folder, or ignored there, or of a kind that the queue's mask
  /// leaves out, nothing comes.
  void Put(const Change& change, TimePoint now);
  /// Asks for the comparison of disk and index at and below a path, in each queue that watches it or something below
  /// it; in the latter case, of what it watches. Also where the mask says nothing of it: changes may have been lost.
  void PutComparison(const std::string& path);

  /// Appends what is due. Returns when something else will be, or TimePoint::max().
  TimePoint Flush(TimePoint now);
  /// Appends all, also of files that are still being written to; waits up to 0.1 s for each queue's lock. "", or a
  /// sentence that says which queue could not take everything and why.
  std::string FlushAll(TimePoint now);

  /// By the queue's path.
  std::map<std::string, QueueFigures> Figures() const;

 private:
  class Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace ferrox::notifyd
