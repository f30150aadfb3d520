#include "services/kovanotifyd/folders/fan_inode_port.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <fstream>
#include <utility>

namespace ferrox::notifyd {

namespace {

using Kind = FolderRecord::Kind;

constexpr const char* kMarkLimitFile = "/proc/sys/fs/fanotify/max_user_marks";
constexpr auto kScope = FanGroup::Scope::kFolder;
constexpr uint64_t kPlaceMask = FAN_MOVE_SELF | FAN_DELETE_SELF | FAN_ONDIR;
constexpr uint64_t kAllMask =
    kPlaceMask | FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ATTRIB | FAN_EVENT_ON_CHILD;

uint64_t MaskOf(FolderPort::Wanted wanted) {
  if (wanted == FolderPort::Wanted::kAll) return kAllMask;
  return wanted == FolderPort::Wanted::kPlace ? kPlaceMask : FAN_ATTRIB | FAN_EVENT_ON_CHILD;
}

/// A 64-bit hash (FNV-1a with an extra shift) of the handle, never 0. Among a million folders, two have the same one on
/// one of some 40 million hosts.
FolderKey Shorten(const HandleKey& handle) {
  if (handle.empty()) return 0;
  uint64_t hash = 0xCBF29CE484222325U;
  for (const char byte : handle) {
    hash = (hash ^ static_cast<unsigned char>(byte)) * 0x100000001B3U;
    hash ^= hash >> 29;
  }
  return hash == 0 ? 1 : hash;
}

/// Adds the changes that the kernel joined in one record, in the order in which they mostly happen.
void AddRecords(const FanRecord& record, uint64_t file, std::vector<FolderRecord>& records) {
  constexpr uint64_t kBoth = FAN_CREATE | FAN_DELETE;
  constexpr struct {
    uint64_t bits;
    Kind kind;
  } kKinds[] = {{kBoth, Kind::kUncertain},         {FAN_CREATE, Kind::kCreated},      {FAN_MODIFY, Kind::kModified},
                {FAN_CLOSE_WRITE, Kind::kWritten}, {FAN_ATTRIB, Kind::kAttributes},   {FAN_DELETE, Kind::kDeleted},
                {FAN_MOVE_SELF, Kind::kSelfMoved}, {FAN_DELETE_SELF, Kind::kSelfGone}};
  const std::string_view name = record.name == "." ? std::string_view() : record.name;
  const FolderKey folder = Shorten(record.folder.empty() ? record.target : record.folder);
  if ((record.mask & FAN_RENAME) != 0) {
    records.push_back({Kind::kRenamed, record.IsFolder(), Shorten(record.new_folder), record.new_name,
                       Shorten(record.folder), record.name});
  }
  uint64_t mask = record.mask;
  for (const auto& row : kKinds) {
    if ((mask & row.bits) != row.bits) continue;
    records.push_back({row.kind, record.IsFolder(), folder, name, 0, {}, file});
    mask &= ~row.bits;
  }
}

}  // namespace

FolderPort::Limit FanInodePort::WatchLimit() const {
  Limit limit{0, "fs.fanotify.max_user_marks"};
  std::ifstream(kMarkLimitFile) >> limit.watches;
  return limit;
}

int FanInodePort::Watch(int folder, Wanted wanted, FolderKey& key) {
  const HandleKey handle = group_.KeyOf(folder);
  if (handle.empty()) return errno;
  LearnNumbers(folder, handle);
  key = Shorten(handle);
  return group_.Mark(folder, kScope, MaskOf(wanted));
}

/// Learns where handles have the inode number from a folder, whose number is known: opening a file by its handle to see
/// its number would take privileges that this port does without.
void FanInodePort::LearnNumbers(int folder, const HandleKey& handle) {
  const std::string form = FanGroup::FormOf(handle);
  const auto known = number_places_.find(form);
  if (known != number_places_.end() && known->second.size == 0) return;
  struct stat status = {};
  if (fstat(folder, &status) != 0) return;
  // A place that is wrong for another folder was right by chance, such as 8 bytes of which the last 4 were 0.
  const bool is_right = known != number_places_.end() && FanGroup::NumberIn(handle, known->second) == status.st_ino;
  if (!is_right) number_places_[form] = FanGroup::FindNumber(handle, status.st_ino);
}

std::string FanInodePort::Reason(int error) const { return FanGroup::Reason(error, kScope); }

void FanInodePort::Unwatch(FolderKey key, const std::string& path) {
  const base::UniqueFd folder(open(path.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!folder.Valid() || Shorten(group_.KeyOf(folder.Get())) != key)
    return;  // elsewhere by now: its records are dropped
  (void)group_.Unmark(folder.Get(), kScope, kAllMask);
}

bool FanInodePort::Read(std::vector<FolderRecord>& records) {
  records.clear();
  if (group_.Read(batch_) != 0) return false;
  for (const FanRecord& record : batch_.records) {
    if (record.IsOverflow()) {
      records.push_back({});
      continue;
    }
    const auto place = number_places_.find(FanGroup::FormOf(record.target));
    AddRecords(record, place == number_places_.end() ? 0 : FanGroup::NumberIn(record.target, place->second), records);
  }
  return true;
}

}  // namespace ferrox::notifyd
