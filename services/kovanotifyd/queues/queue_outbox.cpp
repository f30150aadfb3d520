#include "services/kovanotifyd/queues/queue_outbox.h"

#include <algorithm>
#include <utility>

#include "base/path.h"
#include "fileindex/queue/event.h"
#include "fileindex/queue/queue_line.h"
#include "services/kovanotifyd/queues/folder_cover.h"

namespace ferrox::notifyd {

namespace {

using fileindex::EVENT_ATTR;
using fileindex::EVENT_CREATE;
using fileindex::EVENT_DELETE;
using fileindex::EVENT_MODIFY;
using fileindex::EVENT_REINDEX;
using fileindex::EVENT_RENAME;

/// What a comparison in place of a line has to compare: a folder itself; of a file, the folder that it is in.
ComparedFolder ComparisonFor(const std::string& path, bool is_folder, size_t root_size) {
  const size_t size = is_folder ? path.size() : std::max(base::ParentOf(path).size(), root_size);
  return {size == 0 ? "/" : path.substr(0, size), root_size};
}

}  // namespace

/// Whether the line makes its reader compare everything below its path.
bool QueueOutbox::CoversSubtree(const Line& line) {
  return line.event == EVENT_REINDEX || (line.is_folder && (line.event == EVENT_CREATE || line.event == EVENT_DELETE));
}

const QueueOutbox::Line* QueueOutbox::OpenLine(std::string_view path) const {
  const size_t* place = open_.Find(path);
  return place != nullptr ? &lines_[*place] : nullptr;
}

/// Whether an open line above the path stands for it.
bool QueueOutbox::IsBelowSubtreeLine(std::string_view path) const {
  bool is_below = false;
  if (subtree_lines_ == 0) return false;
  open_.VisitUpwards(base::ParentOf(path), [&](size_t place) { return is_below = CoversSubtree(lines_[place]); });
  return is_below;
}

bool QueueOutbox::CoversContentOf(std::string_view path) const {
  const Line* line = OpenLine(path);
  if (line != nullptr && (line->event & (EVENT_CREATE | EVENT_MODIFY | EVENT_REINDEX)) != 0) return true;
  return IsBelowSubtreeLine(path);
}

void QueueOutbox::Add(uint32_t event, const WatchedName& name, uint32_t mask) {
  if (IsBelowSubtreeLine(name.path)) return;
  if (const size_t* place = open_.Find(name.path)) return Fold(lines_[*place], event, name.is_folder, mask);
  const Line line = {event, name.is_folder, std::string(name.path), name.root_size};
  open_.Insert(line.path, lines_.size());
  Append(line);
}

/// The event of one line for an open line and a later event of the same path. Behind a delete the reader takes nothing
/// but a create, which makes it read all of the file: so a write behind a delete, whose create was not reported,
/// becomes a create if the queue wants these.
uint32_t QueueOutbox::FoldedEvent(const Line& line, uint32_t event, bool is_folder, uint32_t mask) {
  if (line.event == EVENT_REINDEX || line.is_folder != is_folder) return EVENT_REINDEX;
  switch (event) {
    case EVENT_MODIFY:
    case EVENT_ATTR:
      if (line.event == EVENT_DELETE) return (mask & EVENT_CREATE) != 0 ? uint32_t{EVENT_CREATE} : event;
      return line.event == EVENT_ATTR ? event : line.event;
    default:
      return event;
  }
}

void QueueOutbox::Fold(Line& line, uint32_t event, bool is_folder, uint32_t mask) {
  const bool did_cover = CoversSubtree(line);
  line.event = FoldedEvent(line, event, is_folder, mask);
  line.is_folder = line.is_folder || is_folder;
  if (did_cover || !CoversSubtree(line)) return;
  ++subtree_lines_;
  may_cover_ = true;
}

void QueueOutbox::AddRename(const WatchedName& old_name, const WatchedName& name) {
  Line line = {EVENT_RENAME,      name.is_folder, std::string(name.path), name.root_size, std::string(old_name.path),
               old_name.root_size};
  if (name.is_folder) {
    CloseAll();
  } else {
    Close(old_name.path);
    Close(name.path);
  }
  Append(std::move(line));
}

void QueueOutbox::Append(Line line) {
  if (CoversSubtree(line)) {
    ++subtree_lines_;
    may_cover_ = may_cover_ || !lines_.empty();
  }
  lines_.push_back(std::move(line));
  if (lines_.size() > limit_) ReduceLines();
}

void QueueOutbox::Close(std::string_view path) {
  const Line* line = OpenLine(path);
  if (line == nullptr) return;
  if (CoversSubtree(*line)) --subtree_lines_;
  open_.Erase(path);
}

void QueueOutbox::CloseAll() {
  open_ = {};
  subtree_lines_ = 0;
  may_cover_ = false;
}

void QueueOutbox::DropCovered() {
  if (!std::exchange(may_cover_, false) || subtree_lines_ == 0) return;
  std::vector<Line> kept;
  base::PathTable<size_t> open;
  size_t whole = subtree_lines_;
  for (size_t i = 0; i < lines_.size(); ++i) {
    Line& line = lines_[i];
    const size_t* place = line.event == EVENT_RENAME ? nullptr : open_.Find(line.path);
    const bool is_open = place != nullptr && *place == i;
    if (is_open && IsBelowSubtreeLine(line.path)) {
      if (CoversSubtree(line)) --whole;
      continue;
    }
    if (is_open) open.Insert(line.path, kept.size());
    kept.push_back(std::move(line));
  }
  lines_ = std::move(kept);
  open_ = std::move(open);
  subtree_lines_ = whole;
}

/// Called at the limit. Leaves room for a quarter of max_, so that the work is spread over that many additions.
void QueueOutbox::ReduceLines() {
  DropCovered();
  if (lines_.size() > max_ - max_ / 4) ReplaceByComparisons();
  limit_ = std::max(max_, lines_.size() + max_ / 4);
}

/// Replaces all lines by the comparisons of at most a twentieth as many folders.
void QueueOutbox::ReplaceByComparisons() {
  std::vector<ComparedFolder> folders;
  for (const Line& line : lines_) {
    folders.push_back(ComparisonFor(line.path, line.is_folder, line.root_size));
    if (line.event == EVENT_RENAME) folders.push_back(ComparisonFor(line.path_old, line.is_folder, line.root_size_old));
  }
  folders = CoverFolders(std::move(folders), std::max<size_t>(max_ / 20, 1));
  lines_.clear();
  open_ = {};
  subtree_lines_ = folders.size();
  may_cover_ = false;
  for (ComparedFolder& folder : folders) {
    open_.Insert(folder.path, lines_.size());
    lines_.push_back({EVENT_REINDEX, true, std::move(folder.path), folder.root_size});
  }
}

size_t QueueOutbox::Format(size_t first, size_t max_bytes, std::string& text) const {
  size_t at = first;
  const size_t end = text.size() + max_bytes;
  for (; at < lines_.size() && text.size() < end; ++at) {
    const Line& line = lines_[at];
    fileindex::AppendChangeLine(text, line.event, line.is_folder, line.path, line.path_old);
  }
  return at - first;
}

void QueueOutbox::RemoveFirst(size_t count) {
  lines_.erase(lines_.begin(), lines_.begin() + static_cast<std::ptrdiff_t>(count));
  CloseAll();
  if (!lines_.empty()) return;
  limit_ = max_;
  lines_.shrink_to_fit();  // an idle daemon is small, also after a burst
}

}  // namespace ferrox::notifyd
