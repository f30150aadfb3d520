#include "base/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "base/path.h"

namespace base {

namespace {

bool MakeFoldersAs(const std::string& path, mode_t mode, bool durable) {
  if (path.empty()) return true;
  bool made = mkdir(path.c_str(), mode) == 0;
  if (!made && errno == ENOENT) made = MakeFoldersAs(FolderOf(path), mode, durable) && mkdir(path.c_str(), mode) == 0;
  if (!made) return errno == EEXIST;
  return !durable || SyncFolder(FolderOf(path));
}

/// chown takes bits of the mode away and goes first.
bool SetAttributes(int fd, const FileAttributes& attributes) {
  struct stat now = {};
  if (fstat(fd, &now) != 0) return false;
  const bool is_owned = now.st_uid == attributes.uid && now.st_gid == attributes.gid;
  if (!is_owned && fchown(fd, attributes.uid, attributes.gid) != 0) {
    if (attributes.needs_owner) return false;
    errno = 0;
  }
  return fchmod(fd, attributes.mode) == 0;
}

}  // namespace

bool WriteAll(int fd, std::string_view data) {
  while (!data.empty()) {
    const ssize_t written = write(fd, data.data(), data.size());
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return false;
    data.remove_prefix(static_cast<size_t>(written));
  }
  return true;
}

bool ReadAll(int fd, std::string& text, size_t limit_bytes) {
  char buffer[65536];
  size_t taken = 0;
  for (;;) {
    const ssize_t got = read(fd, buffer, sizeof(buffer));
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return got == 0;
    taken += static_cast<size_t>(got);
    if (taken > limit_bytes) {
      errno = EFBIG;
      return false;
    }
    text.append(buffer, static_cast<size_t>(got));
  }
}

bool ReadWholeFile(const std::string& path, std::string& content) {
  const UniqueFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  struct stat status = {};
  if (!file.Valid() || fstat(file.Get(), &status) != 0) return false;
  if (!S_ISREG(status.st_mode)) {
    errno = EINVAL;
    return false;
  }
  content.clear();
  return ReadAll(file.Get(), content);
}

bool SyncFolder(const std::string& folder) {
  const UniqueFd opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return opened.Valid() && fsync(opened.Get()) == 0;
}

bool MakeFolders(const std::string& path, mode_t mode) { return MakeFoldersAs(path, mode, false); }
bool MakeFoldersDurably(const std::string& path, mode_t mode) { return MakeFoldersAs(path, mode, true); }

bool ReplaceFile(const std::string& path, std::string_view content, const FileAttributes& attributes, UniqueFd file,
                 const std::string& temporary) {
  const bool is_replaced = file.Valid() && WriteAll(file.Get(), content) && SetAttributes(file.Get(), attributes) &&
                           fsync(file.Get()) == 0 && file.Close() && rename(temporary.c_str(), path.c_str()) == 0;
  if (is_replaced) return SyncFolder(FolderOf(path));
  const int saved_errno = errno;
  (void)unlink(temporary.c_str());
  errno = saved_errno;
  return false;
}

}  // namespace base
