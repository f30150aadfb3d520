#include "services/kovanotifyd/filesystem/filesystem_watcher.h"

#include <fcntl.h>
#include <malloc.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "base/scope_exit.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::notifyd {

namespace {

using Kind = Change::Kind;

constexpr uint64_t kMask = FAN_CREATE | FAN_DELETE | FAN_RENAME | FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ATTRIB | FAN_ONDIR;
constexpr uint64_t kCookieMask = FAN_ATTRIB | FAN_EVENT_ON_CHILD;
// What changes in the file, rather than in its names.
constexpr uint64_t kFileMask = FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ATTRIB;
// Not renames, which may lead out of a quiet folder, nor the cookie's times.
constexpr uint64_t kQuietMask = FAN_CREATE | FAN_DELETE | FAN_MODIFY | FAN_CLOSE_WRITE;
// How often Read looks for more before it tells of names in doubt, which it would rather do when nothing is waiting.
constexpr int kRoundsMax = 16;
// So many records waiting have taken a megabyte or more.
constexpr size_t kBurst = 4096;

HandleKey KeyOfPath(FanGroup& group, const std::string& path) {
  const base::UniqueFd folder(open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  return folder.Valid() ? group.KeyOf(folder.Get()) : HandleKey();
}

void Tell(WatchListener& listener, Kind kind, const FanRecord& record, const std::string& path,
          const std::string& old_path = {}) {
  listener.OnChange({kind, record.IsFolder(), path, old_path});
}

}  // namespace

FilesystemWatcher::FilesystemWatcher(Options options)
    : options_(std::move(options)),
      mounts_(group_),
      cache_(options_.folders_max),
      locator_(cache_, window_, *this),
      roots_(cache_),
      linked_(mounts_) {}

FilesystemWatcher::~FilesystemWatcher() = default;

void FilesystemWatcher::Add(const WatchRoot& root) {
  Remove(root.path);
  to_add_[root.path] = root;
}

void FilesystemWatcher::Remove(const std::string& root) {
  to_add_.erase(root);
  if (!roots_.Has(root)) return;
  const HandleKey key = roots_.KeyOf(root);
  roots_.Remove(root);
  ReleaseFileSystem(key);
}

bool FilesystemWatcher::Advance(std::chrono::milliseconds at_most, WatchListener& listener) {
  const auto until = std::chrono::steady_clock::now() + at_most;
  const base::ScopeExit close([this] { mounts_.Close(); });
  while (!to_add_.empty()) {
    const std::string root = to_add_.begin()->first;
    to_add_.erase(to_add_.begin());
    const std::string reason = Begin(root);
    if (reason.empty()) {
      listener.OnCovered(root);
    } else {
      listener.OnRefused(root, reason);
    }
    if (std::chrono::steady_clock::now() >= until) break;
  }
  // The places of folders above a root may have been drained on the way, and what else came with them.
  if (!window_.IsEmpty()) WorkThroughWindow(listener);
  return !to_add_.empty();
}

/// "" or why the root cannot be watched.
std::string FilesystemWatcher::Begin(const std::string& root) {
  std::string reason = OpenGroup();
  if (!reason.empty()) return reason;
  const base::UniqueFd folder(open(root.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!folder.Valid()) return "it cannot be opened: " + ErrnoText();
  const HandleKey key = group_.KeyOf(folder.Get());
  if (key.empty()) return FanGroup::Reason(EOPNOTSUPP, FanGroup::Scope::kFileSystem);
  reason = MarkFileSystem(root, folder.Get(), key);
  if (!reason.empty()) ReleaseFileSystem(key);
  return reason;
}

std::string FilesystemWatcher::OpenGroup() {
  if (group_.IsOpen()) return "";
  std::string reason = group_.Open();
  if (!reason.empty()) return reason;
  const std::string folder = Dirname(options_.cookie);
  cookie_folder_ = KeyOfPath(group_, folder);
  cookie_name_ = Basename(options_.cookie);
  const int error = group_.Mark(folder, FanGroup::Scope::kFolder, kCookieMask);
  if (error == 0 && !cookie_folder_.empty()) return "";
  reason = folder + ": " + FanGroup::Reason(error != 0 ? error : EOPNOTSUPP, FanGroup::Scope::kFolder);
  group_ = FanGroup();
  return reason;
}

std::string FilesystemWatcher::MarkFileSystem(const std::string& root, int folder, const HandleKey& key) {
  const int error = group_.Mark(folder, FanGroup::Scope::kFileSystem, kMask);
  if (error != 0) return FanGroup::Reason(error, FanGroup::Scope::kFileSystem);
  std::string reason = mounts_.Add(root, folder, key);
  if (!reason.empty()) return reason;
  // The file system may have been away, and changed elsewhere, or be seen by another mount now.
  cache_.Clear();
  linked_.Clear();
  FolderPlace place;
  const Answer answer = ReadPlace(key, place);
  const Folder* found = locator_.Locate(key);
  if (found == nullptr || answer == Answer::kNowhere) return "what is above it cannot be found out";
  roots_.Add(root, *found);
  FindQuietFolders();
  return "";
}

/// Takes the mark away, and forgets the mounts, when no root needs them any more.
void FilesystemWatcher::ReleaseFileSystem(const HandleKey& key) {
  if (!roots_.PathsOn(key).empty()) return;
  const base::UniqueFd folder = mounts_.Open(key, O_RDONLY | O_DIRECTORY);
  if (folder.Valid()) (void)group_.Unmark(folder.Get(), FanGroup::Scope::kFileSystem, kMask);
  mounts_.Close();
  mounts_.Remove(key);
}

void FilesystemWatcher::FindQuietFolders() {
  std::vector<HandleKey> keys;
  for (const std::string& path : options_.quiet_folders) {
    HandleKey key = KeyOfPath(group_, path);
    if (!key.empty()) keys.push_back(std::move(key));
  }
  roots_.SetQuiet(keys);
}

FolderSource::Answer FilesystemWatcher::ReadPlace(const HandleKey& folder, FolderPlace& place) {
  const Answer answer = mounts_.ReadPlace(folder, place);
  const auto removed = answer == Answer::kNowhere ? removed_.find(folder) : removed_.end();
  if (removed == removed_.end()) return answer;
  place = removed->second;
  return Answer::kPlace;
}

void FilesystemWatcher::Drain(RecordWindow&) {
  while (window_.Size() < options_.records_max) {
    if (!ReadBatch()) return;
  }
  is_overrun_ = true;
}

bool FilesystemWatcher::ReadBatch() {
  FanBatch batch;
  if (!group_.IsOpen() || group_.Read(batch) != 0) return false;
  window_.Add(std::move(batch));
  if (window_.Size() > kBurst) was_burst_ = true;
  return true;
}

bool FilesystemWatcher::Read(WatchListener& listener) {
  const base::ScopeExit close([this] { mounts_.Close(); });
  const bool was_anything = ReadBatch();
  if (!was_anything) Rest();
  for (int round = 0; !window_.IsEmpty(); ++round) {
    WorkThroughWindow(listener);
    if (!history_.HasLoops()) continue;
    const bool is_more = ReadBatch();
    if (is_more && round < kRoundsMax) continue;
    Settle(listener);
    if (!is_more && window_.IsEmpty()) history_.Clear();
  }
  return was_anything;
}

/// Nothing is waiting: what only a burst takes is given back, since a daemon that has nothing to do is to be small.
void FilesystemWatcher::Rest() {
  history_.Clear();
  linked_.Rest();
  removed_.clear();
  if (std::exchange(was_burst_, false)) (void)malloc_trim(0);
}

void FilesystemWatcher::WorkThroughWindow(WatchListener& listener) {
  while (!window_.IsEmpty()) {
    Take(window_.Front(), listener);
    if (is_overrun_) return Lose(listener);
    window_.Pop();
  }
  told_unknown_ = false;
}

/// Tells of the names in doubt, now that all records of them are worked through.
void FilesystemWatcher::Settle(WatchListener& listener) {
  for (const auto& [target, places] : history_.Loops()) {
    if (cache_.Find(target) != nullptr && locator_.LocateAnew(target) == nullptr) cache_.Clear();
    for (const FolderPlace& place : places) {
      (void)FindPaths(place.parent, place.name, paths_, listener);
      for (const std::string& path : paths_) listener.OnChange({Kind::kUncertain, false, path});
    }
  }
}

/// Records were dropped, and with them what moved folders or roots.
void FilesystemWatcher::Lose(WatchListener& listener) {
  if (is_overrun_) window_.Clear();
  is_overrun_ = false;
  cache_.Clear();
  history_.Clear();
  linked_.Clear();
  listener.OnLost();
  for (const std::string& root : roots_.Paths()) {
    listener.OnRootDisturbed(root);
    listener.OnCovered(root);
  }
}

void FilesystemWatcher::Take(const FanRecord& record, WatchListener& listener) {
  if (record.IsOverflow()) return Lose(listener);
  if ((record.mask & FAN_ATTRIB) != 0 && record.name == cookie_name_ && record.folder == cookie_folder_) {
    return listener.OnCookie();
  }
  // It is the number of links of a file that changed; the name that came or went tells of it too.
  if (record.folder.empty()) return linked_.OnLinks(record.target);
  if ((record.mask & FAN_RENAME) != 0) {
    TakeRename(record, listener);
  } else {
    TakeName(record, listener);
  }
  last_rename_.mask = record.mask;
  if (record.IsFolder() && (record.mask & (FAN_RENAME | FAN_DELETE)) != 0) Disturb(record, listener);
}

/// Several changes of one name and object come as one record. What was first and what last can mostly be told, but a
/// name that was both made and removed has to be looked at.
void FilesystemWatcher::TakeName(const FanRecord& record, WatchListener& listener) {
  const uint64_t mask = record.mask;
  const bool is_in_quiet = FindPaths(record.folder, record.name, paths_, listener);
  if ((mask & FAN_CREATE) != 0 && record.IsFolder()) {
    const FolderPlace place = {record.folder, std::string(record.name)};
    (void)locator_.Place(record.target, place);
    if ((mask & FAN_DELETE) != 0 && removed_.size() < options_.records_max) removed_[record.target] = place;
  }
  if (is_in_quiet && (mask & kQuietMask) != 0) Silence(record);
  if (!is_in_quiet && !record.IsFolder() && (mask & kFileMask) != 0) TellByNumber(record, listener);
  if (paths_.empty()) return;
  history_.NoteName(record.target);

  bool is_deleted = (mask & FAN_DELETE) != 0;
  if (is_deleted) {
    for (const std::string& path : paths_) Tell(listener, Kind::kDeleted, record, path);
    const bool may_be_back = (mask & FAN_CREATE) != 0 || history_.HasLeft(record.target);
    history_.Note(record);
    if (may_be_back && !record.IsFolder()) {
      is_deleted = !mounts_.HasName(record.folder, record.name).value_or(false);
    }
  }
  if (is_deleted) return;
  for (const std::string& path : paths_) {
    if ((mask & (FAN_CREATE | FAN_DELETE)) != 0) Tell(listener, Kind::kCreated, record, path);
    if ((mask & FAN_CLOSE_WRITE) != 0) {
      Tell(listener, Kind::kWritten, record, path);
    } else if ((mask & FAN_MODIFY) != 0) {
      Tell(listener, Kind::kModified, record, path);
    }
    if ((mask & FAN_ATTRIB) != 0) Tell(listener, Kind::kAttributes, record, path);
  }
}

/// A root's queue may have the file under another name.
void FilesystemWatcher::TellByNumber(const FanRecord& record, WatchListener& listener) {
  const std::optional<uint64_t> file = linked_.NumberToTell(record);
  if (!file.has_value()) return TellUnknown(record.folder, listener);
  if (*file == 0) return;
  for (const std::string& root : roots_.PathsOn(record.target)) {
    listener.OnChange({Kind::kByNumber, false, root, {}, *file});
  }
}

void FilesystemWatcher::TakeRename(const FanRecord& record, WatchListener& listener) {
  (void)FindPaths(record.folder, record.name, paths_, listener);
  (void)FindPaths(record.new_folder, record.new_name, new_paths_, listener);
  if (!paths_.empty() || !new_paths_.empty()) history_.Note(record);
  if (record.IsFolder()) {
    const FolderPlace place = {record.new_folder, std::string(record.new_name)};
    if (locator_.Place(record.target, place) == nullptr) TellUnknown(record.new_folder, listener);
    const auto removed = removed_.find(record.target);
    if (removed != removed_.end()) removed->second = place;
  }
  // The second record of an exchange: what the first one moved here is there now, and was not replaced by this one.
  if (IsExchange(record)) paths_.clear();
  last_rename_ = {record.mask, record.pid, record.folder, {}, record.new_folder, {}, record.target};
  last_names_[0] = record.name;
  last_names_[1] = record.new_name;

  for (size_t i = 0; i < std::max(paths_.size(), new_paths_.size()); ++i) {
    if (i >= paths_.size()) {
      Tell(listener, Kind::kCreated, record, new_paths_[i]);
    } else if (i >= new_paths_.size()) {
      Tell(listener, Kind::kDeleted, record, paths_[i]);
    } else {
      Tell(listener, Kind::kRenamed, record, new_paths_[i], paths_[i]);
    }
  }
  // A link that was made at the old place afterwards may have been joined with an earlier record of it.
  if (record.IsFolder() || paths_.empty() || !history_.MayHaveName(record.target)) return;
  if (!mounts_.HasName(record.folder, record.name).value_or(false)) return;
  for (const std::string& path : paths_) Tell(listener, Kind::kCreated, record, path);
}

/// Whether the record just before this one is its mirror image, of another file or folder.
bool FilesystemWatcher::IsExchange(const FanRecord& record) const {
  return (last_rename_.mask & FAN_RENAME) != 0 && last_rename_.target != record.target &&
         last_rename_.folder == record.new_folder && last_rename_.new_folder == record.folder &&
         last_names_[0] == record.new_name && last_names_[1] == record.name;
}

/// A root, or a folder above one, is not any more where it was.
void FilesystemWatcher::Disturb(const FanRecord& record, WatchListener& listener) {
  for (const std::string& root : roots_.At(record.target)) listener.OnRootDisturbed(root);
}

/// What the daemons write should not even wake this one: the kernel is told to keep it, as long as it remembers.
void FilesystemWatcher::Silence(const FanRecord& record) {
  if (!can_ignore_) return;
  const base::UniqueFd folder = mounts_.Open(record.folder, O_RDONLY | O_DIRECTORY);
  if (folder.Valid()) can_ignore_ = group_.Ignore(folder.Get(), kQuietMask) != EINVAL;
}

/// Returns whether the folder lies in a quiet one.
bool FilesystemWatcher::FindPaths(const HandleKey& folder, std::string_view name, Paths& paths,
                                  WatchListener& listener) {
  const Folder* found = locator_.Locate(folder);
  if (found != nullptr) return roots_.FullPaths(*found, name, paths);
  paths.clear();
  TellUnknown(folder, listener);
  return false;
}

/// Something happened anywhere on the file system.
void FilesystemWatcher::TellUnknown(const HandleKey& folder, WatchListener& listener) {
  if (std::exchange(told_unknown_, true)) return;
  for (const std::string& root : roots_.PathsOn(folder)) listener.OnChange({Kind::kUncertain, true, root});
}

}  // namespace ferrox::notifyd
