#pragma once

#include <sys/types.h>

#include <string>
#include <vector>

/// Who holds a lock file. A lock of flock needs no more than a file that can be read, so a process that only may read
/// it can keep all others out; the functions here find that process, and make lock files that others cannot open.
namespace kova {

struct LockHolder {
  pid_t pid = 0;
  uid_t user = 0;       ///< who started it
  std::string command;  ///< empty when the process's entry in /proc cannot be read
};

/// The processes that hold a lock on the file at `path`. Root and the holder's own user find them by their open files,
/// others in the kernel's table of locks, which not every file system shows. Looks at every process: only for failures.
std::vector<LockHolder> LockHolders(const std::string& path);

/// "process 12 (sleep) of user 1000 holds the lock"; empty when nobody is found.
std::string LockHolderText(const std::string& path);

/// Whether `path` still names the open file: a file may be replaced or renamed away before the lock on it is taken.
bool IsStillAt(int fd, const std::string& path);

/// Whether a process has been killed, or has ended, although it may still hold locks: a large one for seconds.
bool IsEnding(pid_t pid);

/// Sees to it that others cannot even open the lock file at `path`: makes it when it is missing, and puts a new file in
/// the place of one that they can open, that is theirs, or that one of them holds. A file that is in use by a process
/// of this user's, root's or the folder's owner's is left as it is. Does nothing for whom the folder does not belong
/// to, unless that is root. @return false, with errno, when the file cannot be replaced
bool MakeLockFilePrivate(const std::string& path);

}  // namespace kova
