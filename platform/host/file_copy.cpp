#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <string>

#include <kova/fs.h>

#include "base/files.h"
#include "base/path.h"
#include "base/unique_fd.h"
#include "platform/shared/failure.h"

namespace {

constexpr size_t kStepBytes = 1 << 20;

bool WouldHelpToTryAnotherWay(int error) {
  return error == EXDEV || error == EINVAL || error == ENOSYS || error == EOPNOTSUPP || error == EBADF ||
         error == EPERM;
}

bool CopyByHand(int from, int to) {
  std::string buffer(kStepBytes / 8, '\0');
  for (;;) {
    const ssize_t got = read(from, buffer.data(), buffer.size());
    if (got == 0) return true;
    if (got < 0 && errno == EINTR) continue;
    if (got < 0 || !base::WriteAll(to, {buffer.data(), static_cast<size_t>(got)})) return false;
  }
}

/// Copies what is left of `from`: by the file system, else by the kernel, else by hand. Each goes on where the one
/// before it stopped.
bool CopyContent(int from, int to) {
  ssize_t copied;
  do {
    copied = copy_file_range(from, nullptr, to, nullptr, kStepBytes, 0);
  } while (copied > 0 || (copied < 0 && errno == EINTR));
  // Some file systems report a size of 0 and copy nothing; the ways below find out.
  if (copied < 0 && !WouldHelpToTryAnotherWay(errno)) return false;
  do {
    copied = sendfile(to, from, nullptr, kStepBytes);
  } while (copied > 0 || (copied < 0 && errno == EINTR));
  if (copied < 0 && !WouldHelpToTryAnotherWay(errno)) return false;
  return CopyByHand(from, to);
}

/// Owner and group where the process may set them, mode and times always. Without the owner's identity the bits that
/// lend it are dropped.
bool CopyAttributes(int to, const struct stat& info) {
  mode_t mode = info.st_mode & 07777;
  if (fchown(to, info.st_uid, info.st_gid) != 0) {
    if (errno != EPERM && errno != EINVAL && errno != EOVERFLOW) return false;  // or an id that is unknown there
    mode &= ~static_cast<mode_t>(S_ISUID | S_ISGID);
    (void)!fchown(to, static_cast<uid_t>(-1), info.st_gid);  // a group that the user is in is better than none
  }
  const timespec times[2] = {info.st_atim, info.st_mtim};
  return fchmod(to, mode) == 0 && futimens(to, times) == 0;
}

/// Gives the finished file its name. Without `overwrite` a file that is there already must not be replaced even when it
/// comes at the last moment: by a rename that refuses, else (older file systems) by a hard link, which refuses too.
bool Publish(const std::string& temporary, const std::string& dst, bool overwrite) {
  if (overwrite) return rename(temporary.c_str(), dst.c_str()) == 0;
  if (renameat2(AT_FDCWD, temporary.c_str(), AT_FDCWD, dst.c_str(), RENAME_NOREPLACE) == 0) return true;
  if (errno != EINVAL && errno != ENOSYS) return false;
  if (link(temporary.c_str(), dst.c_str()) != 0) return false;
  (void)unlink(temporary.c_str());  // both names are one file now
  return true;
}

bool Copy(const std::string& src, const std::string& dst, bool overwrite) {
  const base::UniqueFd from(open(src.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat info = {};
  if (!from.Valid() || fstat(from.Get(), &info) != 0) return false;
  if (!S_ISREG(info.st_mode)) {
    errno = EINVAL;
    return false;
  }
  std::string temporary = base::FolderOf(dst) + "/.kova-copy.XXXXXX";
  base::UniqueFd to(mkostemp(temporary.data(), O_CLOEXEC));
  if (!to.Valid()) return false;
  const bool done = CopyContent(from.Get(), to.Get()) && CopyAttributes(to.Get(), info) && fsync(to.Get()) == 0 &&
                    to.Close() && Publish(temporary, dst, overwrite);
  if (done) return true;
  const int saved_errno = errno;
  (void)unlink(temporary.c_str());
  errno = saved_errno;
  return false;
}

bool Move(const std::string& src, const std::string& dst, bool overwrite) {
  if (Publish(src, dst, overwrite)) return true;
  // To another file system. What could not be taken away afterwards is not copied first.
  return errno == EXDEV && faccessat(AT_FDCWD, base::FolderOf(src).c_str(), W_OK, AT_EACCESS) == 0 &&
         Copy(src, dst, overwrite) && unlink(src.c_str()) == 0;
}

}  // namespace

int KOVAFileCopy(const char* src, const char* dst, const KOVAFileCopyOptions* options, int flag) {
  (void)flag;  // no meaning on this host
  if (src == nullptr || dst == nullptr || options == nullptr) return KOVA_FAIL(KOVA_ERR_BAD_PARAMETER);
  const bool overwrite = options->words[0] == 1;
  const bool move = options->words[1] == 1;
  const bool done = move ? Move(src, dst, overwrite) : Copy(src, dst, overwrite);
  return done ? 0 : KOVA_FAIL_ERRNO();
}
