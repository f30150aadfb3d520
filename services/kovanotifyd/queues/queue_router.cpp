#include "services/kovanotifyd/queues/queue_router.h"

#include <limits.h>

#include <algorithm>
#include <string_view>
#include <utility>

#include "fileindex/queue/event.h"

namespace ferrox::notifyd {

using fileindex::EVENT_ATTR;
using fileindex::EVENT_CREATE;
using fileindex::EVENT_DELETE;
using fileindex::EVENT_MODIFY;

namespace {

/// How many files may have writes that are not yet reported. Bounds memory.
constexpr size_t kUnreportedFilesMax = 10000;
/// Factor on Options::longest for writes that are reported by the file's number: each of these adds a line to every
/// queue on the file system, so a file under constant writing is reported less often.
constexpr int kLongestByNumber = 6;

/// Changes of attributes by the file's number are reported sooner: rights are to be known within a second.
constexpr std::chrono::milliseconds kAttributesQuiet{50};
constexpr std::chrono::milliseconds kAttributesLongest{250};

/// A path of PATH_MAX bytes or more cannot be opened and is not indexed, but folders can be nested to such a depth.
bool IsTooLong(const std::string& path) { return path.size() >= PATH_MAX; }

/// The deepest folder above the path whose own path can be opened.
std::string DeepestFolder(const std::string& path) { return path.substr(0, path.rfind('/', PATH_MAX - 1)); }

std::string NumberKey(uint64_t file, const std::string& root) { return std::to_string(file) + root; }

}  // namespace

QueueRouter::QueueRouter(const Options& options)
    : options_(options),
      writes_(options.quiet, options.longest, kUnreportedFilesMax),
      writes_by_number_(options.quiet, kLongestByNumber * options.longest, kUnreportedFilesMax),
      attributes_by_number_(kAttributesQuiet, kAttributesLongest, kUnreportedFilesMax) {}

void QueueRouter::SetQueues(const std::map<std::string, std::vector<QueueWatch>>& queues) {
  rules_ = WatchRules(queues);
  (void)std::erase_if(by_path_, [&queues](const auto& queue) { return queues.count(queue.first) == 0; });
  queues_.clear();
  for (const auto& [path, watches] : queues) {
    std::unique_ptr<QueueWriter>& queue = by_path_[path];
    if (queue == nullptr) {
      queue = std::make_unique<QueueWriter>(path, QueueWriter::Limits{options_.held_max, options_.queue_bytes_max});
    }
    queues_.push_back(queue.get());
  }
}

void QueueRouter::Put(const Change& change, TimePoint now) {
  if (IsTooLong(change.path) || IsTooLong(change.old_path)) return PutTooLong(change);
  switch (change.kind) {
    case Change::Kind::kCreated:
      return AddToQueues(EVENT_CREATE, change.path, change.is_folder);
    case Change::Kind::kModified:
      if (writes_.Touch(change.path, now) || IsWriteCovered(change.path)) return;
      return writes_.Add(change.path, now, ReportWrite());
    case Change::Kind::kWritten:
      writes_.Forget(change.path, change.is_folder);
      return AddToQueues(EVENT_MODIFY, change.path, change.is_folder);
    case Change::Kind::kAttributes:
      return PutAttributes(change);
    case Change::Kind::kDeleted:
      writes_.Forget(change.path, change.is_folder);
      return AddToQueues(EVENT_DELETE, change.path, change.is_folder);
    case Change::Kind::kRenamed:
      writes_.Move(change.old_path, change.path, change.is_folder);
      return PutRename(change);
    case Change::Kind::kByNumber:
      return writes_by_number_.Add(NumberKey(change.file, change.path), now, ReportWriteByNumber());
    case Change::Kind::kAttributesByNumber:
      return attributes_by_number_.Add(NumberKey(change.file, change.path), now, ReportWriteByNumber());
    case Change::Kind::kUncertain:
      return PutComparison(change.path);
  }
}

/// The readers of the queues cannot open the path. They learn that something came or went there by a comparison of the
/// folder above it; changes of its content do not concern them.
void QueueRouter::PutTooLong(const Change& change) {
  if (change.kind == Change::Kind::kModified || change.kind == Change::Kind::kWritten ||
      change.kind == Change::Kind::kAttributes) {
    return;
  }
  if (change.kind == Change::Kind::kRenamed) {
    writes_.Forget(change.old_path, change.is_folder);
    IsTooLong(change.old_path) ? PutComparison(DeepestFolder(change.old_path))
                               : AddToQueues(EVENT_DELETE, change.old_path, change.is_folder);
    if (!IsTooLong(change.path)) return AddToQueues(EVENT_CREATE, change.path, change.is_folder);
  }
  PutComparison(DeepestFolder(change.path));
}

/// Of a folder also to the queues that watch folders below it, as a change of these: who may not pass it may read
/// nothing there.
void QueueRouter::PutAttributes(const Change& change) {
  AddToQueues(EVENT_ATTR, change.path, change.is_folder);
  if (!change.is_folder) return;
  rules_.VisitBelow(change.path, [this](size_t queue, const std::string& watched) {
    for (const Match& match : rules_.MatchesOf(watched)) {
      if (match.queue == queue) AddToQueue(match, EVENT_ATTR, watched, true);
    }
  });
}

/// Merges the queues that watch the old path with those that watch the new one; both lists are in the queues' order.
void QueueRouter::PutRename(const Change& change) {
  const std::vector<Match>& from = rules_.MatchesOfOld(change.old_path);
  const std::vector<Match>& to = rules_.MatchesOf(change.path);
  auto old_match = from.begin();
  auto match = to.begin();
  while (old_match != from.end() || match != to.end()) {
    if (match == to.end() || (old_match != from.end() && old_match->queue < match->queue)) {
      AddToQueue(*old_match++, EVENT_DELETE, change.old_path, change.is_folder);
    } else if (old_match == from.end() || match->queue < old_match->queue) {
      AddToQueue(*match++, EVENT_CREATE, change.path, change.is_folder);
    } else {
      AddRename(change, *old_match++, *match++);
    }
  }
}

/// Of a queue that watches both paths. Without EVENT_RENAME in both masks it gets a delete and a create.
void QueueRouter::AddRename(const Change& change, const Match& from, const Match& to) {
  if ((from.mask & to.mask & fileindex::EVENT_RENAME) == 0) {
    AddToQueue(from, EVENT_DELETE, change.old_path, change.is_folder);
    AddToQueue(to, EVENT_CREATE, change.path, change.is_folder);
    return;
  }
  queues_[from.queue]->AddRename({change.old_path, change.is_folder, from.root_size},
                                 {change.path, change.is_folder, to.root_size});
}

void QueueRouter::AddToQueues(uint32_t event, const std::string& path, bool is_folder) {
  for (const Match& match : rules_.MatchesOf(path)) AddToQueue(match, event, path, is_folder);
}

void QueueRouter::AddToQueue(const Match& match, uint32_t event, const std::string& path, bool is_folder) {
  if ((match.mask & event) != 0) queues_[match.queue]->Add(event, {path, is_folder, match.root_size}, match.mask);
}

void QueueRouter::PutComparison(const std::string& path) {
  for (const Match& match : rules_.MatchesOf(path)) queues_[match.queue]->AddComparison({path, true, match.root_size});
  rules_.VisitBelow(path, [this](size_t queue, const std::string& watched) {
    queues_[queue]->AddComparison({watched, true, watched.size()});
  });
}

/// Whether a write to the file needs no line of its own: in each queue that watches it, the mask leaves writes out, or
/// a line that waits makes the reader read the file's content anyway.
bool QueueRouter::IsWriteCovered(const std::string& path) {
  const std::vector<Match>& matches = rules_.MatchesOf(path);
  return std::all_of(matches.begin(), matches.end(), [&](const Match& match) {
    return (match.mask & EVENT_MODIFY) == 0 || queues_[match.queue]->CoversContentOf(path);
  });
}

WriteDebouncer::Report QueueRouter::ReportWrite() {
  return [this](const std::string& path) { AddToQueues(EVENT_MODIFY, path, false); };
}

/// The name under which the file is known may be in any queue that watches the root, a folder above it, or one below.
WriteDebouncer::Report QueueRouter::ReportWriteByNumber() {
  return [this](const std::string& number_key) {
    const size_t root_at = number_key.find('/');
    const uint64_t file = std::stoull(number_key.substr(0, root_at));
    const std::string root = number_key.substr(root_at);
    for (const Match& match : rules_.MatchesOf(root)) {
      queues_[match.queue]->AddFile(file, match.root_size == 0 ? "/" : root.substr(0, match.root_size));
    }
    rules_.VisitBelow(root, [&](size_t queue, const std::string& watched) { queues_[queue]->AddFile(file, watched); });
  };
}

QueueRouter::TimePoint QueueRouter::Flush(TimePoint now) {
  writes_.ReportDue(now, ReportWrite());
  writes_by_number_.ReportDue(now, ReportWriteByNumber());
  attributes_by_number_.ReportDue(now, ReportWriteByNumber());
  TimePoint next = std::min({writes_.NextDue(), writes_by_number_.NextDue(), attributes_by_number_.NextDue()});
  for (QueueWriter* queue : queues_) next = std::min(next, queue->Flush(now));
  return next;
}

std::string QueueRouter::FlushAll(TimePoint now) {
  writes_.ReportAll(ReportWrite());
  writes_by_number_.ReportAll(ReportWriteByNumber());
  attributes_by_number_.ReportAll(ReportWriteByNumber());
  std::string failures;
  for (QueueWriter* queue : queues_) {
    const std::string reason = queue->FlushAll(now);
    if (!reason.empty()) failures += (failures.empty() ? "queue " : "; queue ") + queue->Path() + ": " + reason;
  }
  return failures;
}

std::map<std::string, QueueFigures> QueueRouter::Figures() const {
  std::map<std::string, QueueFigures> figures;
  for (const auto& [path, queue] : by_path_) figures.emplace(path, queue->Figures());
  return figures;
}

}  // namespace ferrox::notifyd
