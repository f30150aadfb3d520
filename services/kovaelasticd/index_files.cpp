#include "services/kovaelasticd/index_files.h"

#include <unistd.h>

#include <cerrno>

#include "common/file_util.h"
#include "common/log.h"
#include "services/support/daemon.h"

namespace ferrox::engine {

std::string IndexFile(const std::string& folder) { return folder + "/index.sqlite"; }

std::string MarkerFile(const std::string& folder) { return folder + "/uncommitted"; }

void SyncIndexFolder(const std::string& folder) {
  FERROX_FAIL_IF(!SyncFolder(folder), Error::kEngineStorage, "folder " + folder + " cannot be synced: " + ErrnoText());
}

void MakeIndexFolder(const std::string& folder) {
  FERROX_FAIL_IF(!services::MakeFolders(folder, 0700), Error::kEngineStorage,
                 "cannot make the folder " + folder + ": " + ErrnoText());
  SyncIndexFolder(Dirname(folder).empty() ? "/" : Dirname(folder));
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
  SyncIndexFolder(to);
  RemoveIndexFiles(from);
}

}  // namespace ferrox::engine
