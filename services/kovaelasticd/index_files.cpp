#include "services/kovaelasticd/index_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "common/file_util.h"
#include "common/log.h"
#include "common/unique_fd.h"
#include "services/support/daemon.h"

namespace ferrox::engine {

namespace {

void SyncFolder(const std::string& folder) {
  const UniqueFd descriptor(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  FERROX_FAIL_IF(!descriptor.Valid() || fsync(descriptor.Get()) != 0, Error::kEngineStorage,
                 "folder " + folder + " cannot be synced: " + ErrnoText());
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
    FERROX_FAIL_IF(errno != EXDEV || !CPFile(IndexFile(from), IndexFile(to)), Error::kEngineStorage,
                   "cannot move " + IndexFile(from) + " to " + to + ": " + ErrnoText());
  }
  SyncFolder(to);
  RemoveIndexFiles(from);
}

}  // namespace ferrox::engine
