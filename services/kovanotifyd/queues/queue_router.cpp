#include "services/kovanotifyd/queues/queue_router.h"

#include <limits.h>

#include <algorithm>
#include <string_view>
#include <utility>

#include "fileindex/optree/optree.h"
#include "services/kovanotifyd/queues/held_queue.h"
#include "services/kovanotifyd/queues/open_files.h"
#include "services/kovanotifyd/queues/watch_rules.h"

namespace ferrox::notifyd {

using fileindex::EVENT_ATTR;
using fileindex::EVENT_CREATE;
using fileindex::EVENT_DELETE;
using fileindex::EVENT_MODIFY;
using fileindex::EVENT_REINDEX;
using fileindex::EVENT_RENAME;

namespace {

/// Files that may be open with unreported writes at the same time.
constexpr size_t kOpenFilesMax = 10000;
/// What is written to all the time under a name elsewhere wakes every queue on its file system: so much more rarely.
constexpr int kLongestByNumber = 6;

/// Such a path cannot be opened and is not indexed, but folders may be nested as deep as anybody likes.
bool IsTooLong(const std::string& path) { return path.size() >= PATH_MAX; }

/// The deepest folder above the path that can be opened with what is in it.
std::string DeepestFolder(const std::string& path) { return path.substr(0, path.rfind('/', PATH_MAX - 1)); }

}  // namespace

class QueueRouter::Impl {
 public:
  explicit Impl(const Options& options)
      : options_(options),
        open_files_(options.quiet, options.longest, kOpenFilesMax),
        by_number_(options.quiet, kLongestByNumber * options.longest, kOpenFilesMax) {}

  void SetQueues(const std::map<std::string, std::vector<QueueWatch>>& queues);
  void Put(const Change& change, TimePoint now);
  void PutComparison(const std::string& path);
  TimePoint Flush(TimePoint now);
  std::string FlushAll(TimePoint now);
  std::map<std::string, QueueFigures> Figures() const;

 private:
  using Match = WatchRules::Match;

  void Tell(uint32_t event, const std::string& path, bool is_folder);
  void Tell(const Match& match, uint32_t event, const std::string& path, bool is_folder);
  void PutTooLong(const Change& change);
  void Rename(const Change& change);
  void RenameWithin(const Change& change, const Match& from, const Match& to);
  void Compare(size_t queue, const std::string& path, size_t root_size);
  bool IsToldAnyway(const std::string& path);
  OpenFiles::Report ReportWritten();
  OpenFiles::Report ReportByNumber();

  Options options_;
  WatchRules rules_;
  std::map<std::string, std::unique_ptr<HeldQueue>> by_path_;
  std::vector<HeldQueue*> queues_;  // by_path_'s in order, as rules_ counts them
  OpenFiles open_files_;
  OpenFiles by_number_;  // a file's number, and a root, in place of a path
};

void QueueRouter::Impl::SetQueues(const std::map<std::string, std::vector<QueueWatch>>& queues) {
  rules_ = WatchRules(queues);
  (void)std::erase_if(by_path_, [&queues](const auto& queue) { return queues.count(queue.first) == 0; });
  queues_.clear();
  for (const auto& [path, watches] : queues) {
    std::unique_ptr<HeldQueue>& queue = by_path_[path];
    if (queue == nullptr) queue = std::make_unique<HeldQueue>(path, options_);
    queues_.push_back(queue.get());
  }
}

void QueueRouter::Impl::Put(const Change& change, TimePoint now) {
  if (IsTooLong(change.path) || IsTooLong(change.old_path)) return PutTooLong(change);
  switch (change.kind) {
    case Change::Kind::kCreated:
      return Tell(EVENT_CREATE, change.path, change.is_folder);
    case Change::Kind::kModified:
      if (open_files_.Touch(change.path, now) || IsToldAnyway(change.path)) return;
      return open_files_.Add(change.path, now, ReportWritten());
    case Change::Kind::kWritten:
      open_files_.Forget(change.path, change.is_folder);
      return Tell(EVENT_MODIFY, change.path, change.is_folder);
    case Change::Kind::kAttributes:
      return Tell(EVENT_ATTR, change.path, change.is_folder);
    case Change::Kind::kDeleted:
      open_files_.Forget(change.path, change.is_folder);
      return Tell(EVENT_DELETE, change.path, change.is_folder);
    case Change::Kind::kRenamed:
      open_files_.Move(change.old_path, change.path, change.is_folder);
      return Rename(change);
    case Change::Kind::kByNumber:
      return by_number_.Add(std::to_string(change.file) + change.path, now, ReportByNumber());
    case Change::Kind::kUncertain:
      return PutComparison(change.path);
  }
}

/// Of what cannot be indexed, the reader needs to know that it is there, or has gone, and not what is in it.
void QueueRouter::Impl::PutTooLong(const Change& change) {
  if (change.kind == Change::Kind::kModified || change.kind == Change::Kind::kWritten ||
      change.kind == Change::Kind::kAttributes) {
    return;
  }
  if (change.kind == Change::Kind::kRenamed) {
    open_files_.Forget(change.old_path, change.is_folder);
    IsTooLong(change.old_path) ? PutComparison(DeepestFolder(change.old_path))
                               : Tell(EVENT_DELETE, change.old_path, change.is_folder);
    if (!IsTooLong(change.path)) return Tell(EVENT_CREATE, change.path, change.is_folder);
  }
  PutComparison(DeepestFolder(change.path));
}

/// Whether no queue needs to hear of a write to the file: none wants to, or a line that waits will say as much.
bool QueueRouter::Impl::IsToldAnyway(const std::string& path) {
  const std::vector<Match>& matches = rules_.MatchesOf(path);
  return std::all_of(matches.begin(), matches.end(), [&](const Match& match) {
    return (match.mask & EVENT_MODIFY) == 0 || queues_[match.queue]->Outbox().TellsContentOf(path);
  });
}

OpenFiles::Report QueueRouter::Impl::ReportWritten() {
  return [this](const std::string& path) { Tell(EVENT_MODIFY, path, false); };
}

/// Each queue that watches the root, or something below it, may have the file.
OpenFiles::Report QueueRouter::Impl::ReportByNumber() {
  return [this](const std::string& number_and_root) {
    const size_t root_at = number_and_root.find('/');
    const uint64_t file = std::stoull(number_and_root.substr(0, root_at));
    const std::string root = number_and_root.substr(root_at);
    for (const Match& match : rules_.MatchesOf(root)) {
      queues_[match.queue]->NoteFile(file, match.root_size == 0 ? "/" : root.substr(0, match.root_size));
    }
    rules_.VisitBelow(root, [&](size_t queue, const std::string& watched) { queues_[queue]->NoteFile(file, watched); });
  };
}

void QueueRouter::Impl::Tell(uint32_t event, const std::string& path, bool is_folder) {
  for (const Match& match : rules_.MatchesOf(path)) Tell(match, event, path, is_folder);
}

void QueueRouter::Impl::Tell(const Match& match, uint32_t event, const std::string& path, bool is_folder) {
  if ((match.mask & event) == 0) return;
  HeldQueue& queue = *queues_[match.queue];
  queue.Outbox().Add(event, {path, is_folder, match.root_size}, match.mask);
  queue.NoteAge();
}

/// Goes through the queues that watch either place, both lists being in the queues' order.
void QueueRouter::Impl::Rename(const Change& change) {
  const std::vector<Match>& from = rules_.MatchesOfOld(change.old_path);
  const std::vector<Match>& to = rules_.MatchesOf(change.path);
  auto old_match = from.begin();
  auto match = to.begin();
  while (old_match != from.end() || match != to.end()) {
    if (match == to.end() || (old_match != from.end() && old_match->queue < match->queue)) {
      Tell(*old_match++, EVENT_DELETE, change.old_path, change.is_folder);
    } else if (old_match == from.end() || match->queue < old_match->queue) {
      Tell(*match++, EVENT_CREATE, change.path, change.is_folder);
    } else {
      RenameWithin(change, *old_match++, *match++);
    }
  }
}

void QueueRouter::Impl::RenameWithin(const Change& change, const Match& from, const Match& to) {
  if ((from.mask & to.mask & EVENT_RENAME) == 0) {
    Tell(from, EVENT_DELETE, change.old_path, change.is_folder);
    Tell(to, EVENT_CREATE, change.path, change.is_folder);
    return;
  }
  HeldQueue& queue = *queues_[from.queue];
  queue.Outbox().AddRename({change.old_path, change.is_folder, from.root_size},
                           {change.path, change.is_folder, to.root_size});
  queue.NoteAge();
}

void QueueRouter::Impl::Compare(size_t queue, const std::string& path, size_t root_size) {
  queues_[queue]->Outbox().Add(EVENT_REINDEX, {path, true, root_size}, EVENT_REINDEX);
  queues_[queue]->NoteAge();
}

void QueueRouter::Impl::PutComparison(const std::string& path) {
  for (const Match& match : rules_.MatchesOf(path)) Compare(match.queue, path, match.root_size);
  rules_.VisitBelow(path, [this](size_t queue, const std::string& root) { Compare(queue, root, root.size()); });
}

QueueRouter::TimePoint QueueRouter::Impl::Flush(TimePoint now) {
  open_files_.ReportDue(now, ReportWritten());
  by_number_.ReportDue(now, ReportByNumber());
  TimePoint next = std::min(open_files_.NextDue(), by_number_.NextDue());
  for (HeldQueue* queue : queues_) next = std::min(next, queue->Flush(now));
  return next;
}

std::string QueueRouter::Impl::FlushAll(TimePoint now) {
  open_files_.ReportAll(ReportWritten());
  by_number_.ReportAll(ReportByNumber());
  std::string failures;
  for (HeldQueue* queue : queues_) {
    const std::string reason = queue->FlushAll(now);
    if (!reason.empty()) failures += (failures.empty() ? "queue " : "; queue ") + queue->Path() + ": " + reason;
  }
  return failures;
}

std::map<std::string, QueueFigures> QueueRouter::Impl::Figures() const {
  std::map<std::string, QueueFigures> figures;
  for (const auto& [path, queue] : by_path_) figures.emplace(path, queue->Figures());
  return figures;
}

QueueRouter::QueueRouter(const Options& options) : impl_(std::make_unique<Impl>(options)) {}
QueueRouter::~QueueRouter() = default;

void QueueRouter::SetQueues(const std::map<std::string, std::vector<QueueWatch>>& queues) { impl_->SetQueues(queues); }
void QueueRouter::Put(const Change& change, TimePoint now) { impl_->Put(change, now); }
void QueueRouter::PutComparison(const std::string& path) { impl_->PutComparison(path); }
QueueRouter::TimePoint QueueRouter::Flush(TimePoint now) { return impl_->Flush(now); }
std::string QueueRouter::FlushAll(TimePoint now) { return impl_->FlushAll(now); }
std::map<std::string, QueueFigures> QueueRouter::Figures() const { return impl_->Figures(); }

}  // namespace ferrox::notifyd
