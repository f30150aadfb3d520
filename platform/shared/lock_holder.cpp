#include <fcntl.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>

#include <kova/lock_holder.h>

#include "base/files.h"
#include "base/path.h"
#include "base/unique_fd.h"

namespace kova {

namespace {

/// The content of a file below /proc, as far as it can be read: a process may end meanwhile, and reading its files
/// fails then.
std::string ReadProcFile(const std::string& path) {
  std::string text;
  (void)base::ReadWholeFile(path, text);
  return text;
}

std::string ProcessFolder(pid_t pid) { return "/proc/" + std::to_string(pid); }

/// What follows "Name:" and blanks in a process's status, to the end of the line.
std::string StatusField(const std::string& status, const std::string& name) {
  const size_t line = status.find("\n" + name + ":");
  if (line == std::string::npos) return {};
  const size_t begin = status.find_first_not_of(" \t", line + name.size() + 2);
  return begin == std::string::npos ? std::string() : status.substr(begin, status.find('\n', begin) - begin);
}

/// The names in a folder that are numbers.
std::vector<int> NumbersIn(const std::string& folder) {
  std::vector<int> numbers;
  std::error_code error;
  for (std::filesystem::directory_iterator entry(folder, error), end; !error && entry != end; entry.increment(error)) {
    const int number = atoi(entry->path().filename().c_str());
    if (number > 0) numbers.push_back(number);
  }
  return numbers;
}

/// Whether the process holds a lock by one of its open files. That it has the file open says nothing: the kernel lists
/// the locks of each open file in its "fdinfo", also those that another process took and has inherited to it.
bool Holds(pid_t pid, const struct stat& file) {
  const std::string folder = ProcessFolder(pid);
  for (const int fd : NumbersIn(folder + "/fd")) {
    struct stat open_file = {};
    const std::string name = std::to_string(fd);
    if (stat((folder + "/fd/" + name).c_str(), &open_file) != 0) continue;
    if (open_file.st_dev != file.st_dev || open_file.st_ino != file.st_ino) continue;
    if (ReadProcFile(folder + "/fdinfo/" + name).find("\nlock:") != std::string::npos) return true;
  }
  return false;
}

/// By the kernel's table: "1: FLOCK  ADVISORY  WRITE 1234 08:01:5678 0 EOF", in the second place "->" for who waits.
std::vector<pid_t> InLockTable(const struct stat& file) {
  std::vector<pid_t> pids;
  std::ifstream table("/proc/locks");
  for (std::string line; std::getline(table, line);) {
    int pid = 0;
    unsigned device_major = 0, device_minor = 0;
    uint64_t inode = 0;
    const bool read =
        sscanf(line.c_str(), "%*d: %*s %*s %*s %d %x:%x:%" SCNu64, &pid, &device_major, &device_minor, &inode) == 4;
    if (read && pid > 0 && makedev(device_major, device_minor) == file.st_dev && inode == file.st_ino) {
      pids.push_back(pid);
    }
  }
  return pids;
}

LockHolder Describe(pid_t pid) {
  LockHolder holder;
  holder.pid = pid;
  const std::string status = "\n" + ReadProcFile(ProcessFolder(pid) + "/status");
  holder.command = StatusField(status, "Name");
  holder.user = static_cast<uid_t>(strtoul(StatusField(status, "Uid").c_str(), nullptr, 10));
  return holder;
}

bool IsOurs(uid_t user, const struct stat& folder) { return user == 0 || user == geteuid() || user == folder.st_uid; }

bool IsHeldByOthers(const std::string& path, const struct stat& folder) {
  const std::vector<LockHolder> holders = LockHolders(path);
  return std::any_of(holders.begin(), holders.end(),
                     [&](const LockHolder& holder) { return !holder.command.empty() && !IsOurs(holder.user, folder); });
}

bool IsAt(const std::string& path, const struct stat& file) {
  struct stat named = {};
  return lstat(path.c_str(), &named) == 0 && named.st_dev == file.st_dev && named.st_ino == file.st_ino;
}

/// What a look at a lock file came to. kAgain: another process changed what is at the path meanwhile.
enum class Outcome { kPrivate, kFailed, kAgain };

bool GiveToOwnerOf(const struct stat& folder, int fd) {
  return geteuid() != 0 || folder.st_uid == 0 || fchown(fd, folder.st_uid, folder.st_gid) == 0;
}

/// The new file belongs to the folder's owner, also when root makes it.
Outcome MakeNew(const std::string& path, const struct stat& folder) {
  const base::UniqueFd file(open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (!file.Valid()) return errno == EEXIST ? Outcome::kAgain : Outcome::kFailed;
  return GiveToOwnerOf(folder, file.Get()) ? Outcome::kPrivate : Outcome::kFailed;
}

/// Puts a new file in the place of `old`: whatever else is there by now, somebody may already rely on.
Outcome Replace(const std::string& path, const struct stat& old, const struct stat& folder) {
  std::string temporary = path + ".XXXXXX";
  const base::UniqueFd file(mkostemp(temporary.data(), O_CLOEXEC));
  if (!file.Valid()) return Outcome::kFailed;
  const bool is_ours = GiveToOwnerOf(folder, file.Get());
  const bool is_old = IsAt(path, old);
  if (is_ours && is_old && rename(temporary.c_str(), path.c_str()) == 0) return Outcome::kPrivate;
  const int saved_errno = errno;
  (void)unlink(temporary.c_str());
  errno = saved_errno;
  return is_ours && !is_old ? Outcome::kAgain : Outcome::kFailed;
}

Outcome TryToMakePrivate(const std::string& path, const struct stat& folder) {
  struct stat file = {};
  if (lstat(path.c_str(), &file) != 0) return errno == ENOENT ? MakeNew(path, folder) : Outcome::kFailed;
  // What is no file of ours but lies here by our own doing is not for us to remove: it fails when it is opened.
  if (!S_ISREG(file.st_mode) && IsOurs(file.st_uid, folder)) return Outcome::kPrivate;
  const base::UniqueFd opened(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  bool is_private = false, in_use = false;
  if (opened.Valid() && fstat(opened.Get(), &file) == 0 && S_ISREG(file.st_mode)) {
    // While it is held here, nobody else replaces it, or takes it for the file that will be in its place.
    in_use = flock(opened.Get(), LOCK_EX | LOCK_NB) != 0;
    if (!IsAt(path, file)) return Outcome::kAgain;
    is_private = IsOurs(file.st_uid, folder) && (file.st_mode & 077) == 0 && file.st_nlink == 1;
  }
  const bool good = in_use ? !IsHeldByOthers(path, folder) : is_private;
  return good ? Outcome::kPrivate : Replace(path, file, folder);
}

}  // namespace

std::vector<LockHolder> LockHolders(const std::string& path) {
  std::vector<LockHolder> holders;
  struct stat file = {};
  if (stat(path.c_str(), &file) != 0) return holders;
  for (const pid_t pid : NumbersIn("/proc")) {
    if (pid != getpid() && Holds(pid, file)) holders.push_back(Describe(pid));
  }
  if (!holders.empty()) return holders;
  for (const pid_t pid : InLockTable(file)) holders.push_back(Describe(pid));
  return holders;
}

std::string LockHolderText(const std::string& path) {
  const std::vector<LockHolder> holders = LockHolders(path);
  if (holders.empty()) return {};
  const LockHolder& first = holders.front();
  return "process " + std::to_string(first.pid) + " (" + (first.command.empty() ? "?" : first.command) + ") of user " +
         std::to_string(first.user) + " holds the lock";
}

bool IsStillAt(int fd, const std::string& path) {
  struct stat opened = {};
  return fstat(fd, &opened) == 0 && IsAt(path, opened);
}

bool IsEnding(pid_t pid) {
  const std::string status = "\n" + ReadProcFile(ProcessFolder(pid) + "/status");
  const std::string state = StatusField(status, "State");
  if (state.empty()) return kill(pid, 0) != 0 && errno == ESRCH;  // others' may be hidden
  if (state.front() == 'Z' || state.front() == 'X') return true;
  if (StatusField(status, "CoreDumping") == "1") return true;
  const uint64_t killed = UINT64_C(1) << (SIGKILL - 1);
  return ((strtoull(StatusField(status, "ShdPnd").c_str(), nullptr, 16) |
           strtoull(StatusField(status, "SigPnd").c_str(), nullptr, 16)) &
          killed) != 0;
}

bool MakeLockFilePrivate(const std::string& path) {
  struct stat folder = {};
  if (stat(base::FolderOf(path).c_str(), &folder) != 0) return false;
  if (geteuid() != 0 && geteuid() != folder.st_uid) return true;
  constexpr int kAttempts = 100;
  Outcome outcome = Outcome::kAgain;
  for (int attempt = 0; attempt < kAttempts && outcome == Outcome::kAgain; ++attempt) {
    outcome = TryToMakePrivate(path, folder);
  }
  if (outcome == Outcome::kAgain) errno = EBUSY;
  return outcome == Outcome::kPrivate;
}

}  // namespace kova
