#include "services/kovanotifyd/filesystem/mounted_folders.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "base/path.h"
#include "common/file_util.h"

namespace ferrox::notifyd {

namespace {

constexpr int kOpenFolder = O_RDONLY | O_DIRECTORY | O_CLOEXEC;

/// Whether a folder is the top of a mount, or removed.
struct Standing {
  bool is_top = false;
  bool is_removed = false;
};

/// False with errno set.
bool ReadStanding(int folder, Standing& standing) {
  struct statx figures = {};
  if (statx(folder, "", AT_EMPTY_PATH | AT_STATX_DONT_SYNC, STATX_NLINK, &figures) != 0) return false;
  standing.is_top = (figures.stx_attributes & STATX_ATTR_MOUNT_ROOT) != 0;
  standing.is_removed = figures.stx_nlink == 0;
  return true;
}

/// The number of the mount that the folder is on; 0 where the kernel does not tell.
uint64_t MountOf(const std::string& path) {
  struct statx figures = {};
  constexpr unsigned kMountId = 0x1000;  // STATX_MNT_ID, newer than the headers of some hosts
  if (statx(AT_FDCWD, path.c_str(), AT_SYMLINK_NOFOLLOW, kMountId, &figures) != 0) return 0;
  return figures.stx_mnt_id;
}

/// The highest folder above `path` on the same mount, whose path stays right whatever is renamed below it.
std::string TopOfMount(std::string path) {
  const uint64_t mount = MountOf(path);
  while (mount != 0 && path != "/") {
    const std::string above = Dirname(path).empty() ? "/" : Dirname(path);
    if (MountOf(above) != mount) break;
    path = above;
  }
  return path;
}

/// The last name in the folder's path, as the kernel tells it. "" with errno set, also for a path beyond PATH_MAX.
std::string NameOf(int folder) {
  char link[32];
  (void)snprintf(link, sizeof link, "/proc/self/fd/%d", folder);
  char path[PATH_MAX];
  const ssize_t size = readlink(link, path, sizeof path);
  if (size <= 0) return {};
  return base::NameOf({path, static_cast<size_t>(size)});
}

/// Without a change of its access time, where that is permitted.
base::UniqueFd OpenAbove(int folder) {
  base::UniqueFd above(openat(folder, "..", kOpenFolder | O_NOATIME));
  return above.Valid() || errno != EPERM ? std::move(above) : base::UniqueFd(openat(folder, "..", kOpenFolder));
}

/// Returns when changes of names in the folder that were under way are done and their records queued: the kernel does
/// both under the folder's lock, which reading the folder takes too. The read itself may fail: its buffer is too small.
void WaitForChangesUnderWay(int folder) {
  char entry[8];
  (void)syscall(SYS_getdents64, folder, entry, sizeof entry);
}

}  // namespace

std::string MountedFolders::Add(const std::string& path, int folder, const HandleKey& key) {
  const std::string top = TopOfMount(path);
  auto anchor = std::find_if(anchors_.begin(), anchors_.end(), [&](const Anchor& known) {
    return known.path == top && FanGroup::IsSameFileSystem(known.key, key);
  });
  if (anchor == anchors_.end()) anchor = anchors_.insert(anchor, Anchor{top, key});
  if (!IsOpen(*anchor)) return "its mount cannot be opened";
  struct stat there = {};
  struct stat reached = {};
  const base::UniqueFd again = FanGroup::OpenKey(key, anchor->fd.Get(), O_PATH | O_DIRECTORY);
  if (!again.Valid() && errno == EPERM) return "opening folders by handle needs the capability CAP_DAC_READ_SEARCH";
  if (!again.Valid()) return "the file system does not open folders by handle: " + std::string(strerror(errno));
  if (fstat(folder, &there) != 0 || fstat(again.Get(), &reached) != 0 || there.st_dev != reached.st_dev ||
      there.st_ino != reached.st_ino || NameOf(again.Get()).empty() != (path == "/")) {
    return "the file system opens another folder by the handle";
  }
  return "";
}

void MountedFolders::Remove(const HandleKey& key) {
  anchors_.erase(std::remove_if(anchors_.begin(), anchors_.end(),
                                [&key](const Anchor& anchor) { return FanGroup::IsSameFileSystem(anchor.key, key); }),
                 anchors_.end());
}

void MountedFolders::Close() {
  for (Anchor& anchor : anchors_) anchor.fd.Reset();
}

/// Opens the mount unless it is open. False when something else is mounted at its path now, or nothing.
bool MountedFolders::IsOpen(Anchor& anchor) {
  if (anchor.fd.Valid()) return true;
  base::UniqueFd fd(open(anchor.path.c_str(), kOpenFolder));
  if (!fd.Valid() || !FanGroup::IsSameFileSystem(group_.KeyOf(fd.Get()), anchor.key)) return false;
  anchor.fd = std::move(fd);
  return true;
}

base::UniqueFd MountedFolders::Open(const HandleKey& folder, int flags) {
  errno = ENOENT;
  for (Anchor& anchor : anchors_) {
    if (!FanGroup::IsSameFileSystem(anchor.key, folder) || !IsOpen(anchor)) continue;
    return FanGroup::OpenKey(folder, anchor.fd.Get(), flags);
  }
  return base::UniqueFd();
}

/// A file system may have several mounts: what is outside of one, or its top, may be below a folder of another.
FolderSource::Answer MountedFolders::ReadPlace(const HandleKey& folder, FolderPlace& place) {
  FolderSource::Answer answer = FolderSource::Answer::kNowhere;
  for (Anchor& anchor : anchors_) {
    if (!FanGroup::IsSameFileSystem(anchor.key, folder) || !IsOpen(anchor)) continue;
    const FolderSource::Answer seen = ReadPlaceBy(anchor.fd.Get(), folder, place);
    if (seen == FolderSource::Answer::kPlace || seen == FolderSource::Answer::kFailed) return seen;
    if (seen == FolderSource::Answer::kTop) answer = seen;
  }
  return answer;
}

FolderSource::Answer MountedFolders::ReadPlaceBy(int mount, const HandleKey& folder, FolderPlace& place) {
  const auto failure = [] {
    const bool is_gone = errno == ESTALE || errno == ENOENT || errno == ENAMETOOLONG;
    return is_gone ? FolderSource::Answer::kNowhere : FolderSource::Answer::kFailed;
  };
  Standing standing;
  const base::UniqueFd fd = FanGroup::OpenKey(folder, mount, O_PATH | O_DIRECTORY);
  if (!fd.Valid() || !ReadStanding(fd.Get(), standing)) return failure();
  if (standing.is_top) return FolderSource::Answer::kTop;
  const base::UniqueFd above = OpenAbove(fd.Get());
  if (!above.Valid()) return failure();
  place.parent = group_.KeyOf(above.Get(), folder);
  place.name = NameOf(fd.Get());
  if (place.parent.empty() || place.name.empty()) return failure();
  WaitForChangesUnderWay(above.Get());
  // Asked last: of a removed folder, the kernel adds " (deleted)" to the name.
  if (!ReadStanding(fd.Get(), standing)) return failure();
  if (standing.is_removed || place.parent == folder) return FolderSource::Answer::kNowhere;
  return FolderSource::Answer::kPlace;
}

uint64_t MountedFolders::NumberOf(const HandleKey& folder, std::string_view name) {
  const base::UniqueFd fd = Open(folder, O_PATH | O_DIRECTORY);
  struct stat found = {};
  const bool is_there = fd.Valid() && fstatat(fd.Get(), std::string(name).c_str(), &found, AT_SYMLINK_NOFOLLOW) == 0;
  return is_there ? found.st_ino : 0;
}

std::optional<bool> MountedFolders::HasName(const HandleKey& folder, std::string_view name) {
  const base::UniqueFd fd = Open(folder, O_PATH | O_DIRECTORY);
  if (!fd.Valid()) return {};
  struct stat found = {};
  return fstatat(fd.Get(), std::string(name).c_str(), &found, AT_SYMLINK_NOFOLLOW) == 0;
}

}  // namespace ferrox::notifyd
