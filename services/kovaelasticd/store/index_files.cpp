#include "services/kovaelasticd/store/index_files.h"

#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <ctime>
#include <vector>

#include "base/files.h"
#include "base/path.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::engine {

namespace {

constexpr char kSetAside[] = ".damaged-";

/// What was set aside of the file at `path`.
std::vector<std::string> SetAsideOf(const std::string& path) {
  std::vector<std::string> found;
  const base::OpenFolderPtr folder(opendir(base::FolderOf(path).c_str()));
  if (folder == nullptr) return found;
  while (const dirent* entry = readdir(folder.get())) {
    if (StringStartWith(entry->d_name, Basename(path) + kSetAside))
      found.push_back(base::FolderOf(path) + "/" + entry->d_name);
  }
  return found;
}

std::string Day(int64_t now) {
  const time_t seconds = now;
  struct tm local = {};
  char text[16] = {};
  if (localtime_r(&seconds, &local) == nullptr || strftime(text, sizeof(text), "%Y-%m-%d", &local) == 0) return "?";
  return text;
}

}  // namespace

/// An empty file without a log is what is left of one that was being made.
bool IsIndexFileLost(const std::string& folder) {
  struct stat status = {};
  if (lstat(IndexFile(folder).c_str(), &status) != 0) return errno == ENOENT;
  return S_ISREG(status.st_mode) && status.st_size == 0 && !IsFileExist(IndexFile(folder) + "-wal");
}

/// By device numbers: a folder is a mount point when its parent is on another device. What does not exist yet counts as
/// its nearest parent.
std::string MountPointOf(const std::string& path) {
  std::string at = path;
  struct stat here = {};
  while (at != "/" && stat(at.c_str(), &here) != 0) at = base::FolderOf(at);
  struct stat above = {};
  while (at != "/" && stat(at.c_str(), &here) == 0 && stat(base::FolderOf(at).c_str(), &above) == 0 &&
         above.st_dev == here.st_dev) {
    at = base::FolderOf(at);
  }
  return at;
}

void RemoveSetAside(const std::string& path) {
  for (const std::string& kept : SetAsideOf(path)) (void)Unlink(kept);
}

void SetAside(const std::string& path, int64_t now) {
  struct stat status = {};
  const bool there = lstat(path.c_str(), &status) == 0;
  if (!there && errno == ENOENT) return;
  FERROX_FAIL_IF(!there, Error::kEngineStorage, "cannot set " + path + " aside: " + ErrnoText());
  FERROX_FAIL_IF(!S_ISREG(status.st_mode), Error::kEngineStorage,
                 path + " is not a regular file, which no engine makes; move it away");
  RemoveSetAside(path);
  const std::string kept = path + kSetAside + Day(now);
  FERROX_FAIL_IF(chmod(path.c_str(), 0600) != 0 || rename(path.c_str(), kept.c_str()) != 0, Error::kEngineStorage,
                 "cannot set " + path + " aside: " + ErrnoText());
  SyncIndexFolder(base::FolderOf(path));
}

void SetAsideIndexFiles(const std::string& folder, int64_t now) {
  if (!IsIndexFileLost(folder)) SetAside(IndexFile(folder), now);
  for (const char* suffix : {"-wal", "-shm"}) (void)Unlink(IndexFile(folder) + suffix);
  RemoveUpgradeFile(IndexFile(folder));
  (void)Unlink(MarkerFile(folder));
}

std::string IndexFile(const std::string& folder) { return folder + "/index.sqlite"; }

std::string UpgradeFile(const std::string& index_file) { return index_file + ".upgrade"; }

void RemoveUpgradeFile(const std::string& index_file) {
  for (const char* suffix : {"", "-wal", "-shm"}) (void)Unlink(UpgradeFile(index_file) + suffix);
}

std::string MarkerFile(const std::string& folder) { return folder + "/uncommitted"; }

void SyncIndexFolder(const std::string& folder) {
  FERROX_FAIL_IF(!SyncFolder(folder), Error::kEngineStorage, "folder " + folder + " cannot be synced: " + ErrnoText());
}

void MakeIndexFolder(const std::string& folder) {
  FERROX_FAIL_IF(!base::MakeFolders(folder, 0700), Error::kEngineStorage,
                 "cannot make the folder " + folder + ": " + ErrnoText());
  SyncIndexFolder(Dirname(folder).empty() ? "/" : Dirname(folder));
}

void RemoveIndexFiles(const std::string& folder) {
  for (const char* suffix : {"", "-wal", "-shm"}) {
    const std::string path = IndexFile(folder) + suffix;
    FERROX_FAIL_IF(!Unlink(path), Error::kEngineStorage, "cannot remove " + path + ": " + ErrnoText());
  }
  RemoveUpgradeFile(IndexFile(folder));
  (void)Unlink(MarkerFile(folder));
  RemoveSetAside(IndexFile(folder));
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
