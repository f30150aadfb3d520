#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "services/kovanotifyd/change.h"
#include "services/kovanotifyd/queues/queue_watch.h"
#include "services/kovanotifyd/queues/queue_writer.h"
#include "services/kovanotifyd/queues/watch_rules.h"
#include "services/kovanotifyd/queues/write_debouncer.h"

namespace ferrox::notifyd {

/// Turns changes into lines of the queues that watch their paths, and appends these lines to the queues' files.
///
/// The way of a change: WatchRules finds the queues, with the mask of each; writes to open files wait in a
/// WriteDebouncer; each queue's QueueWriter joins the lines that wait together (QueueOutbox) and appends them.
///
/// A change in watched folders of several queues goes to each of them. A rename of which a queue watches only one side
/// is a create or a delete for that queue. A file that is written to is reported when it is closed, or, while it stays
/// open, once it has been quiet for some time, or at the latest after a few seconds, instead of for each write.
///
/// Belongs to one thread. Nothing here blocks longer than a write to a queue's file, except FlushAll.
class QueueRouter {
 public:
  using TimePoint = std::chrono::steady_clock::time_point;

  struct Options {
    std::chrono::milliseconds quiet{500};     ///< without a write, after which a file that stays open is reported
    std::chrono::milliseconds longest{5000};  ///< from the first write, after which it is reported in any case
    uint64_t held_max = 20000;                ///< lines of one queue in memory; beyond it they become comparisons
    uint64_t queue_bytes_max = 64U << 20;     ///< a queue's file of this size is not appended to
  };

  explicit QueueRouter(const Options& options);
  QueueRouter(const QueueRouter&) = delete;
  QueueRouter& operator=(const QueueRouter&) = delete;

  /// Replaces what each queue, by the path of its file, watches. Lines in memory are kept for queues that stay, and
  /// dropped for those that are gone.
  void SetQueues(const std::map<std::string, std::vector<QueueWatch>>& queues);

  /// Adds the lines of a change to the queues. Nothing is added for a path outside of all watched folders, an ignored
  /// one, or a kind of change that is not in the queue's mask.
  void Put(const Change& change, TimePoint now);
  /// Asks for a comparison of disk and index at and below a path, in each queue that watches the path or a folder below
  /// it; of the latter, only the watched folder is compared. Independent of the masks, since any change may have been
  /// missed there.
  void PutComparison(const std::string& path);

  /// Appends what is due. Returns when the next line will be due, or TimePoint::max() when none waits.
  TimePoint Flush(TimePoint now);
  /// Appends everything, including writes to files that are still open. Waits up to 0.1 s for the lock of each queue.
  /// Returns "", or a sentence that names the queues that could not take all their lines, and why.
  std::string FlushAll(TimePoint now);

  /// By the path of the queue's file.
  std::map<std::string, QueueFigures> Figures() const;

 private:
  using Match = WatchRules::Match;

  void PutTooLong(const Change& change);
  void PutAttributes(const Change& change);
  void PutRename(const Change& change);
  void AddRename(const Change& change, const Match& from, const Match& to);
  void AddToQueues(uint32_t event, const std::string& path, bool is_folder);
  void AddToQueue(const Match& match, uint32_t event, const std::string& path, bool is_folder);
  bool IsWriteCovered(const std::string& path);
  WriteDebouncer::Report ReportWrite();
  WriteDebouncer::Report ReportWriteByNumber();

  Options options_;
  WatchRules rules_;
  std::map<std::string, std::unique_ptr<QueueWriter>> by_path_;
  std::vector<QueueWriter*> queues_;  ///< those of by_path_ in its order; WatchRules counts queues in that order
  WriteDebouncer writes_;             ///< by path
  // By a key made of the file's number and a root (Change::Kind::kByNumber, kAttributesByNumber).
  WriteDebouncer writes_by_number_;
  WriteDebouncer attributes_by_number_;
};

}  // namespace ferrox::notifyd
