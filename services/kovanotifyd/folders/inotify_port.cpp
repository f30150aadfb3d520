#include "services/kovanotifyd/folders/inotify_port.h"

#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <unordered_map>

#include "common/log.h"

namespace ferrox::notifyd {

namespace {

using Kind = FolderRecord::Kind;

constexpr size_t kBatchBytes = 256 * 1024;
/// That one Read may join, which it does while a move has its first half in the last one and its second half not yet.
constexpr size_t kBatches = 4;
/// How long to wait for that second half. There may be none: the folder was moved out of what is watched.
constexpr int kMoveWaitMs = 10;
constexpr const char* kWatchLimitFile = "/proc/sys/fs/inotify/max_user_watches";

uint32_t InotifyMask(FolderPort::Wanted wanted) {
  constexpr uint32_t kPlace = IN_MOVE_SELF | IN_DELETE_SELF;
  constexpr uint32_t kNames = IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO;
  constexpr uint32_t kContent = IN_MODIFY | IN_CLOSE_WRITE | IN_ATTRIB | IN_EXCL_UNLINK;
  switch (wanted) {
    case FolderPort::Wanted::kAll:
      return kNames | kContent | kPlace;
    case FolderPort::Wanted::kPlace:
      return kPlace;
    case FolderPort::Wanted::kCookie:
      return IN_ATTRIB;
  }
  return 0;
}

FolderKey KeyOf(const inotify_event& event) { return event.wd > 0 ? static_cast<FolderKey>(event.wd) : 0; }

/// False for an event that adds nothing to others, such as IN_DELETE_SELF, which IN_IGNORED follows.
bool KindOf(const inotify_event& event, Kind& kind) {
  constexpr struct {
    uint32_t bit;
    Kind kind;
  } kKinds[] = {{IN_Q_OVERFLOW, Kind::kLost},   {IN_CREATE, Kind::kCreated},      {IN_MOVED_TO, Kind::kCreated},
                {IN_DELETE, Kind::kDeleted},    {IN_MOVED_FROM, Kind::kRenamed},  {IN_MODIFY, Kind::kModified},
                {IN_ATTRIB, Kind::kAttributes}, {IN_CLOSE_WRITE, Kind::kWritten}, {IN_MOVE_SELF, Kind::kSelfMoved},
                {IN_IGNORED, Kind::kSelfGone}};
  for (const auto& row : kKinds) {
    if ((event.mask & row.bit) == 0) continue;
    kind = row.kind;
    return true;
  }
  return false;
}

FolderRecord RecordOf(const inotify_event& event, Kind kind) {
  const std::string_view name = event.len > 0 ? event.name : "";
  return {kind, (event.mask & IN_ISDIR) != 0, KeyOf(event), name, 0, {}};
}

std::vector<const inotify_event*> EventsIn(const char* buffer, size_t size) {
  std::vector<const inotify_event*> events;
  for (size_t at = 0; at < size;) {
    events.push_back(reinterpret_cast<const inotify_event*>(buffer + at));
    at += sizeof(inotify_event) + events.back()->len;
  }
  return events;
}

/// The second half of a move, which leads to a watched folder, and whether its first half was found.
struct Arrival {
  const inotify_event* event;
  bool paired = false;
};
using Arrivals = std::unordered_map<uint32_t, Arrival>;  ///< by the kernel's cookie of the move

/// Adds those from the event `first` on. Returns whether each move that begins there has both halves.
bool PairMoves(const std::vector<const inotify_event*>& events, size_t first, Arrivals& arrivals) {
  for (size_t i = first; i < events.size(); ++i) {
    if ((events[i]->mask & IN_MOVED_TO) != 0) arrivals.emplace(events[i]->cookie, Arrival{events[i]});
  }
  for (size_t i = first; i < events.size(); ++i) {
    if ((events[i]->mask & IN_MOVED_FROM) != 0 && arrivals.count(events[i]->cookie) == 0) return false;
  }
  return true;
}

/// A move is reported in the place of its first half: events between the halves concern the folder in its new place.
void AddRecord(const inotify_event& event, Arrivals& arrivals, std::vector<FolderRecord>& records) {
  Kind kind{};
  if (!KindOf(event, kind)) return;
  FolderRecord record = RecordOf(event, kind);
  const auto arrival = event.cookie == 0 ? arrivals.end() : arrivals.find(event.cookie);
  if ((event.mask & IN_MOVED_TO) != 0 && arrival->second.paired) return;
  if ((event.mask & IN_MOVED_FROM) != 0) {
    record = {Kind::kRenamed, record.is_folder, 0, {}, record.folder, record.name};
    if (arrival != arrivals.end()) {
      record.folder = KeyOf(*arrival->second.event);
      record.name = arrival->second.event->name;
      arrival->second.paired = true;
    }
  }
  records.push_back(record);
}

}  // namespace

std::string InotifyPort::Open() {
  inotify_.Reset(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (inotify_.Valid()) return "";
  if (errno == EMFILE) return "too many inotify instances or open files; raise fs.inotify.max_user_instances";
  return "inotify cannot be opened: " + ErrnoText();
}

FolderPort::Limit InotifyPort::WatchLimit() const {
  Limit limit{0, "fs.inotify.max_user_watches"};
  std::ifstream(kWatchLimitFile) >> limit.watches;
  return limit;
}

int InotifyPort::Watch(int folder, Wanted wanted, FolderKey& key) {
  // Through the descriptor, so that it is this folder that is watched, whatever lies at its path by now.
  const std::string path = "/proc/self/fd/" + std::to_string(folder);
  const int watch = inotify_add_watch(inotify_.Get(), path.c_str(), InotifyMask(wanted) | IN_ONLYDIR | IN_MASK_ADD);
  if (watch < 0) return errno;
  key = static_cast<FolderKey>(watch);
  return 0;
}

std::string InotifyPort::Reason(int error) const { return strerror(error); }

void InotifyPort::Unwatch(FolderKey key, const std::string& /*path*/) {
  (void)inotify_rm_watch(inotify_.Get(),
                         static_cast<int>(key));  // fails where the folder is gone and the watch with it
}

/// Appends a batch to the buffer; false when nothing was waiting.
bool InotifyPort::Fill() {
  if (!buffer_) buffer_.reset(new char[kBatches * kBatchBytes]);  // not cleared: only what is used is in memory
  const ssize_t size = read(inotify_.Get(), buffer_.get() + filled_, kBatchBytes);
  if (size <= 0) return false;
  filled_ += static_cast<size_t>(size);
  return true;
}

bool InotifyPort::Read(std::vector<FolderRecord>& records) {
  records.clear();
  filled_ = 0;
  if (!Fill()) return false;
  auto events = EventsIn(buffer_.get(), filled_);
  Arrivals arrivals;
  pollfd more = {inotify_.Get(), POLLIN, 0};
  for (size_t first = 0, fills = 1; !PairMoves(events, first, arrivals) && fills < kBatches; ++fills) {
    first = events.size();
    if (poll(&more, 1, kMoveWaitMs) <= 0 || !Fill()) break;
    events = EventsIn(buffer_.get(), filled_);
  }
  for (const inotify_event* event : events) AddRecord(*event, arrivals, records);
  return true;
}

}  // namespace ferrox::notifyd
