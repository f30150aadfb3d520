#include "services/kovaelasticd/index_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "common/file_util.h"
#include "common/log.h"
#include "common/unique_fd.h"
#include "services/support/daemon.h"

namespace ferrox::engine {

namespace {

constexpr size_t kCopyChunkBytes = 256 * 1024;

void SyncFolder(const std::string& folder) {
  const UniqueFd descriptor(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  FERROX_FAIL_IF(!descriptor.Valid() || fsync(descriptor.Get()) != 0, Error::kEngineStorage,
                 "folder " + folder + " cannot be synced: " + ErrnoText());
}

bool WriteAll(int fd, const char* data, size_t size) {
  while (size > 0) {
    const ssize_t written = write(fd, data, size);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return false;
    data += written;
    size -= static_cast<size_t>(written);
  }
  return true;
}

bool CopyContent(int from, int to) {
  std::string buffer(kCopyChunkBytes, '\0');
  for (;;) {
    const ssize_t got = read(from, buffer.data(), buffer.size());
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return got == 0 && fsync(to) == 0;
    if (!WriteAll(to, buffer.data(), static_cast<size_t>(got))) return false;
  }
}

/// Copies to a volume that a rename does not reach; the copy appears whole or not at all.
void CopyFile(const std::string& from, const std::string& to) {
  const std::string beside = to + ".moving";
  const UniqueFd source(open(from.c_str(), O_RDONLY | O_CLOEXEC));
  const UniqueFd target(open(beside.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0600));
  const bool copied = source.Valid() && target.Valid() && CopyContent(source.Get(), target.Get()) &&
                      rename(beside.c_str(), to.c_str()) == 0;
  const std::string reason = copied ? "" : ErrnoText();
  if (!copied) (void)unlink(beside.c_str());
  FERROX_FAIL_IF(!copied, Error::kEngineStorage, "cannot copy " + from + " to " + to + ": " + reason);
}

}  // namespace

std::string IndexFile(const std::string& folder) { return folder + "/index.sqlite"; }

std::string MarkerFile(const std::string& folder) { return folder + "/uncommitted"; }

void MakeIndexFolder(const std::string& folder) {
  FERROX_FAIL_IF(!services::MakeFolders(folder, 0700), Error::kEngineStorage,
                 "cannot make the folder " + folder + ": " + ErrnoText());
  SyncFolder(Dirname(folder).empty() ? "/" : Dirname(folder));
}

void RemoveIndexFiles(const std::string& folder) {
  for (const char* suffix : {"", "-wal", "-shm"}) {
    const std::string path = IndexFile(folder) + suffix;
    FERROX_FAIL_IF(!Unlink(path), Error::kEngineStorage, "cannot remove " + path + ": " + ErrnoText());
  }
  (void)Unlink(MarkerFile(folder));
  (void)rmdir(folder.c_str());  // other files in it are not ours
}

void MoveIndexFiles(const std::string& from, const std::string& to) {
  // A closed index has no other file; where one is left, moving would separate it from the index.
  FERROX_FAIL_IF(IsFileExist(IndexFile(from) + "-wal"), Error::kEngineStorage,
                 "the index in " + from + " is in use by another program; end it and try again");
  MakeIndexFolder(to);
  if (rename(IndexFile(from).c_str(), IndexFile(to).c_str()) != 0) {
    FERROX_FAIL_IF(errno != EXDEV, Error::kEngineStorage,
                   "cannot move " + IndexFile(from) + " to " + to + ": " + ErrnoText());
    CopyFile(IndexFile(from), IndexFile(to));
  }
  SyncFolder(to);
  RemoveIndexFiles(from);
}

}  // namespace ferrox::engine
