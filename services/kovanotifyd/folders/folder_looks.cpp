#include <dirent.h>
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "services/kovanotifyd/folders/folder_watcher.h"

// Looking at one folder of the disk: it is watched, then listed, so that nothing made in it is missed.

namespace ferrox::notifyd {

namespace {

struct DirClose {
  void operator()(DIR* dir) const { (void)closedir(dir); }
};

/// The folder at the path, with no link on the way; -1 and errno.
int OpenFolder(const std::string& path) {
  constexpr int kFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK;
  open_how how = {};
  how.flags = kFlags;
  how.resolve = RESOLVE_NO_SYMLINKS;
  const auto fd = static_cast<int>(syscall(SYS_openat2, AT_FDCWD, path.c_str(), &how, sizeof(how)));
  return fd >= 0 || (errno != ENOSYS && errno != EPERM) ? fd : open(path.c_str(), kFlags);
}

/// Tells mounts apart.
uint64_t MountOf(int folder) {
  struct statx status = {};
  if (statx(folder, "", AT_EMPTY_PATH, STATX_MNT_ID, &status) < 0) return 0;
  if ((status.stx_mask & STATX_MNT_ID) != 0 && status.stx_mnt_id != 0) return status.stx_mnt_id;
  return uint64_t{status.stx_dev_major} << 32 | status.stx_dev_minor;
}

bool IsAt(const std::string& path, int folder) {
  struct stat there = {};
  struct stat ours = {};
  return lstat(path.c_str(), &there) == 0 && fstat(folder, &ours) == 0 && there.st_ino == ours.st_ino &&
         there.st_dev == ours.st_dev;
}

bool IsFolder(const dirent& entry, int parent) {
  if (entry.d_type != DT_UNKNOWN) return entry.d_type == DT_DIR;
  struct stat status = {};
  return fstatat(parent, entry.d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 && S_ISDIR(status.st_mode);
}

std::string TooMany(const FolderPort::Limit& limit) {
  return "too many folders for the " + std::to_string(limit.watches) + " watches that " + limit.setting +
         " allows, of which 80 % are used at most; raise it";
}

bool IsDots(std::string_view name) { return name == "." || name == ".."; }

}  // namespace

/// Of a folder that a record or a listing has just told of, or that may be another than before.
void FolderWatcher::LookAndReport(Id id, bool always, WatchListener& listener) {
  const std::string path = tree_.Path(id);
  const bool was_unreadable = tree_.Has(id, FolderTree::kUnreadable);
  std::vector<Ref> below;
  const Seen seen = Look(id, always, below, listener);
  for (const Ref ref : below) checks_.push_back({ref, always});
  if (seen == Seen::kNew || (seen == Seen::kUnreadable && !was_unreadable)) {
    listener.OnChange({Change::Kind::kCreated, true, path});
  } else if (seen == Seen::kOther || seen == Seen::kGone) {
    listener.OnChange({Change::Kind::kUncertain, true, path});
  }
}

/// Watches the folder at the place of `id`. Where it is new there, or always, it is listed, and the folders in it are
/// added to `below`. `id` may be gone afterwards.
FolderWatcher::Seen FolderWatcher::Look(Id id, bool always, std::vector<Ref>& below, WatchListener& listener) {
  base::UniqueFd folder(OpenFolder(tree_.Path(id)));
  if (!folder.Valid()) return Unwatchable(id, errno, listener);
  if (!IsOnRootsMount(id, folder.Get())) {
    RemoveFolder(id, listener);
    return Seen::kGone;
  }
  const Seen seen = Attach(id, folder.Get(), listener);
  if (seen != Seen::kSame && seen != Seen::kNew && seen != Seen::kOther) return seen;
  looked_at_.push_back(tree_.RefOf(id));
  if (tree_.Has(id, FolderTree::kRoot)) WatchPassages(id);
  if (always || seen != Seen::kSame) List(id, std::move(folder), below, listener);
  return seen;
}

FolderWatcher::Seen FolderWatcher::Attach(Id id, int folder, WatchListener& listener) {
  const FolderKey old = tree_.Key(id);
  if (old == 0 && tree_.Keys() >= watches_max_) return Unwatchable(id, ENOSPC, listener);
  FolderKey key = 0;
  const int error = port_->Watch(folder, FolderPort::Wanted::kAll, key);
  if (error != 0) return Unwatchable(id, error, listener);
  tree_.Set(id, FolderTree::kUnreadable, false);
  if (key == old) return Seen::kSame;
  if (!Claim(id, folder, key, listener)) return Seen::kRefused;
  DropKey(id);
  tree_.SetKey(id, key);
  return old == 0 ? Seen::kNew : Seen::kOther;
}

/// Takes the key from the folder that has it: the kernel's folder is here now, and what is there is to be looked at
/// again. Unless it is in both places, bound by a mount: then records would not tell which of them they mean.
bool FolderWatcher::Claim(Id id, int folder, FolderKey key, WatchListener& listener) {
  const Id other = tree_.ByKey(key);
  if (other == kNone) return true;
  const std::string other_path = tree_.Path(other);
  if (IsAt(other_path, folder) && IsAt(tree_.Path(id), folder)) {
    for (const std::string& root : RootsOver(id)) {
      Refuse(root, "holds the folder " + other_path + ", which is watched there already", listener);
    }
    return false;
  }
  tree_.SetKey(other, 0);
  checks_.push_back({tree_.RefOf(other), false});
  return true;
}

/// What comes of it that the folder at the place of `id` is not there, cannot be read, or cannot be watched.
FolderWatcher::Seen FolderWatcher::Unwatchable(Id id, int error, WatchListener& listener) {
  const bool gone = error == ENOENT || error == ENOTDIR || error == ELOOP || error == ESTALE;
  const bool unreadable = error == EACCES || error == ENAMETOOLONG || error == EIO;
  if (!gone && !unreadable) {
    const std::string reason = error == ENOSPC ? TooMany(port_->WatchLimit()) : port_->Reason(error);
    for (const std::string& root : RootsOver(id)) Refuse(root, reason, listener);
    return Seen::kRefused;
  }
  const Ref ref = tree_.RefOf(id);
  if (tree_.Has(id, FolderTree::kRoot)) Refuse(tree_.Path(id), strerror(error), listener);
  if (tree_.Get(ref) == kNone || !IsCovered(id)) return Seen::kRefused;
  if (gone) {
    ForgetGone(id, listener);
    return Seen::kGone;
  }
  DropKey(id);
  for (const Ref child : Children(id)) {
    if (!LeadsToRoot(child.id)) tree_.Remove(child.id, [this](Id each) { DropKey(each); });
  }
  if (!tree_.Has(id, FolderTree::kUnreadable)) unreadable_.push_back(ref);
  tree_.Set(id, FolderTree::kUnreadable, true);
  return Seen::kUnreadable;
}

void FolderWatcher::ForgetGone(Id id, WatchListener& listener) {
  if (LeadsToRoot(id) && tree_.Key(id) == 0) return;  // stays for the root's sake
  // What lies above it may have been moved, with it: that is known when all records have been read.
  doubts_.push_back({tree_.RefOf(tree_.Parent(id)), std::string(tree_.Name(id))});
  RemoveFolder(id, listener);
}

/// Brings the tree's folders below `id` in line with those in the open folder.
void FolderWatcher::List(Id id, base::UniqueFd folder, std::vector<Ref>& below, WatchListener& listener) {
  const auto ignored = IgnoredIn(id);
  const std::unique_ptr<DIR, DirClose> dir(fdopendir(folder.Get()));
  if (dir == nullptr) return;
  const int fd = folder.Release();
  errno = 0;
  for (const dirent* entry = readdir(dir.get()); entry != nullptr; errno = 0, entry = readdir(dir.get())) {
    const std::string_view name = entry->d_name;
    if (IsDots(name) || !IsFolder(*entry, fd)) continue;
    Id child = tree_.Child(id, name);
    const bool wanted = std::any_of(ignored.begin(), ignored.end(), [name](const auto* names) {
      return std::find(names->begin(), names->end(), name) == names->end();
    });
    if (wanted) {
      if (child == kNone) child = tree_.Add(id, name);
      below.push_back(tree_.RefOf(child));
    }
    if (child != kNone) tree_.Set(child, FolderTree::kSeen, wanted || tree_.Has(child, FolderTree::kPassage));
  }
  const bool complete = errno == 0;
  for (const Ref child : Children(id)) {
    if (tree_.Get(child) == kNone) continue;
    const bool seen = tree_.Has(child.id, FolderTree::kSeen) || tree_.Has(child.id, FolderTree::kRoot);
    tree_.Set(child.id, FolderTree::kSeen, false);
    if (complete && !seen) RemoveFolder(child.id, listener);
  }
}

/// Notes the mount where `id` is a root; elsewhere, whether it is the root's.
bool FolderWatcher::IsOnRootsMount(Id id, int folder) {
  const uint64_t mount = MountOf(folder);
  Id root = id;
  while (!tree_.Has(root, FolderTree::kRoot)) root = tree_.Parent(root);
  const auto found = roots_.find(tree_.Path(root));
  if (root == id) found->second.mount = mount;
  return found->second.mount == mount || found->second.mount == 0;
}

/// Which folder is there now, and whether one is there at all that the tree does not have.
void FolderWatcher::CheckPlace(const Place& place, WatchListener& listener) {
  const Id parent = tree_.Get(place.parent);
  if (parent == kNone || !IsCovered(parent) || !IsWanted(parent, place.name)) return;
  Id child = tree_.Child(parent, place.name);
  if (child == kNone) {
    struct stat status = {};
    if (lstat(tree_.Path(parent, place.name).c_str(), &status) < 0 || !S_ISDIR(status.st_mode)) {
      if (!IsAllRead()) doubts_.push_back(place);  // what lies above it may have been moved just now
      return;
    }
    child = tree_.Add(parent, place.name);
  }
  LookAndReport(child, false, listener);
}

}  // namespace ferrox::notifyd
