#include "services/kovanotifyd/queues/queue_outbox.h"

#include <algorithm>
#include <utility>

#include "fileindex/optree/optree.h"
#include "services/kovanotifyd/queues/folder_cover.h"
#include "services/kovanotifyd/queues/queue_line.h"

namespace ferrox::notifyd {

namespace {

using fileindex::EVENT_ATTR;
using fileindex::EVENT_CREATE;
using fileindex::EVENT_DELETE;
using fileindex::EVENT_MODIFY;
using fileindex::EVENT_REINDEX;
using fileindex::EVENT_RENAME;

std::string_view ParentOf(std::string_view path) { return path.substr(0, path.rfind('/')); }

/// What is to be compared for a line that is to be given up: a folder itself, of a file the folder that it is in.
Place PlaceOf(const std::string& path, bool is_folder, size_t root_size) {
  const size_t size = is_folder ? path.size() : std::max(ParentOf(path).size(), root_size);
  return {size == 0 ? "/" : path.substr(0, size), root_size};
}

}  // namespace

/// Whether the line asks for a look at all below its path.
bool QueueOutbox::IsWhole(const Line& line) {
  return line.event == EVENT_REINDEX || (line.is_folder && (line.event == EVENT_CREATE || line.event == EVENT_DELETE));
}

const QueueOutbox::Line* QueueOutbox::OpenLine(std::string_view path) const {
  const size_t* place = open_.Find(path);
  return place != nullptr ? &lines_[*place] : nullptr;
}

bool QueueOutbox::IsBelowWhole(std::string_view path) const {
  bool is_below = false;
  if (whole_ == 0) return false;
  open_.VisitUpwards(ParentOf(path), [&](size_t place) { return is_below = IsWhole(lines_[place]); });
  return is_below;
}

bool QueueOutbox::TellsContentOf(std::string_view path) const {
  const Line* line = OpenLine(path);
  if (line != nullptr && (line->event & (EVENT_CREATE | EVENT_MODIFY | EVENT_REINDEX)) != 0) return true;
  return IsBelowWhole(path);
}

void QueueOutbox::Add(uint32_t event, const WatchedName& name, uint32_t mask) {
  if (IsBelowWhole(name.path)) return;
  if (const size_t* place = open_.Find(name.path)) return Fold(lines_[*place], event, name.is_folder, mask);
  const Line line = {event, name.is_folder, std::string(name.path), name.root_size};
  open_.Insert(line.path, lines_.size());
  Append(line);
}

/// The event of the one line that says what the line and a later event of its path say. The index daemon drops what
/// follows a delete but a create, and by a create it looks at everything: a name that lives again is told by that.
uint32_t QueueOutbox::Folded(const Line& line, uint32_t event, bool is_folder, uint32_t mask) {
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
  const bool was_whole = IsWhole(line);
  line.event = Folded(line, event, is_folder, mask);
  line.is_folder = line.is_folder || is_folder;
  if (was_whole || !IsWhole(line)) return;
  ++whole_;
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
  if (IsWhole(line)) {
    ++whole_;
    may_cover_ = may_cover_ || !lines_.empty();
  }
  lines_.push_back(std::move(line));
  if (lines_.size() > limit_) Bound();
}

void QueueOutbox::Close(std::string_view path) {
  const Line* line = OpenLine(path);
  if (line == nullptr) return;
  if (IsWhole(*line)) --whole_;
  open_.Erase(path);
}

void QueueOutbox::CloseAll() {
  open_ = {};
  whole_ = 0;
  may_cover_ = false;
}

void QueueOutbox::Tidy() {
  if (!std::exchange(may_cover_, false) || whole_ == 0) return;
  std::vector<Line> kept;
  base::PathTable<size_t> open;
  size_t whole = whole_;
  for (size_t i = 0; i < lines_.size(); ++i) {
    Line& line = lines_[i];
    const size_t* place = line.event == EVENT_RENAME ? nullptr : open_.Find(line.path);
    const bool is_open = place != nullptr && *place == i;
    if (is_open && IsBelowWhole(line.path)) {
      if (IsWhole(line)) --whole;
      continue;
    }
    if (is_open) open.Insert(line.path, kept.size());
    kept.push_back(std::move(line));
  }
  lines_ = std::move(kept);
  open_ = std::move(open);
  whole_ = whole;
}

/// Called when the lines are too many. Leaves so few that it is long until the next time.
void QueueOutbox::Bound() {
  Tidy();
  if (lines_.size() > max_ - max_ / 4) TakeFolders();
  limit_ = std::max(max_, lines_.size() + max_ / 4);
}

/// Puts comparisons of few folders in the place of all lines.
void QueueOutbox::TakeFolders() {
  std::vector<Place> places;
  for (const Line& line : lines_) {
    places.push_back(PlaceOf(line.path, line.is_folder, line.root_size));
    if (line.event == EVENT_RENAME) places.push_back(PlaceOf(line.path_old, line.is_folder, line.root_size_old));
  }
  places = CoverPlaces(std::move(places), std::max<size_t>(max_ / 20, 1));
  lines_.clear();
  open_ = {};
  whole_ = places.size();
  may_cover_ = false;
  for (Place& place : places) {
    open_.Insert(place.path, lines_.size());
    lines_.push_back({EVENT_REINDEX, true, std::move(place.path), place.root_size});
  }
}

size_t QueueOutbox::Format(size_t first, size_t max_bytes, std::string& text) const {
  size_t at = first;
  const size_t end = text.size() + max_bytes;
  for (; at < lines_.size() && text.size() < end; ++at) {
    const Line& line = lines_[at];
    AppendQueueLine(text, line.event, line.is_folder, line.path, line.path_old);
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
