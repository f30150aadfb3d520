#include "base/open_beneath.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>

#include "base/path.h"

namespace base {

namespace {

constexpr int kFileFlags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY;
constexpr int kFolderFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;

/// openat2 does all of it in one call, without a race (Linux 5.6).
int AskKernel(int root, const char* below, int flags) {
  open_how how = {};
  how.flags = static_cast<uint64_t>(flags);
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS;
  return static_cast<int>(syscall(SYS_openat2, root, below, &how, sizeof(how)));
}

/// Opens a folder without following a link. The kernel reports a link in its place as ENOTDIR; here it is ELOOP.
UniqueFd StepInto(int folder, const char* name) {
  UniqueFd next(openat(folder, name, kFolderFlags));
  struct stat info = {};
  if (!next.Valid() && errno == ENOTDIR) {
    const bool is_link = fstatat(folder, name, &info, AT_SYMLINK_NOFOLLOW) == 0 && S_ISLNK(info.st_mode);
    errno = is_link ? ELOOP : ENOTDIR;
  }
  return next;
}

/// The same step by step: each folder is opened without following a link, relative to the one before, so a swap in
/// between cannot lead elsewhere.
int Walk(int root, const std::string& below, int flags) {
  UniqueFd folder(openat(root, ".", kFolderFlags));
  size_t begin = 0;
  for (size_t slash; folder.Valid() && (slash = below.find('/', begin)) != std::string::npos; begin = slash + 1) {
    const std::string name = below.substr(begin, slash - begin);
    if (name == "..") return errno = EXDEV, -1;
    if (!name.empty()) folder = StepInto(folder.Get(), name.c_str());
  }
  const std::string last = below.substr(begin);
  if (last == "..") return errno = EXDEV, -1;
  return folder.Valid() ? openat(folder.Get(), last.c_str(), flags) : -1;
}

/// ENOSYS, E2BIG and EINVAL say that the kernel does not know the call, or a flag of it.
int Open(int root, const std::string& below, int flags, bool may_ask_kernel) {
  if (may_ask_kernel) {
    const int fd = AskKernel(root, below.c_str(), flags);
    if (fd >= 0 || (errno != ENOSYS && errno != E2BIG && errno != EINVAL)) return fd;
  }
  return Walk(root, below, flags);
}

}  // namespace

UniqueFd OpenBeneath(const std::string& root, const std::string& path, bool may_ask_kernel) {
  const size_t begin = root == "/" ? 1 : root.size() + 1;
  const bool is_below = IsBelow(path, root) && path.size() > begin && path.find('\0') == std::string::npos;
  if (!is_below) return errno = EINVAL, UniqueFd();
  const UniqueFd folder(open(root.empty() ? "/" : root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (!folder.Valid()) return UniqueFd();
  const std::string below = path.substr(begin);
  int fd = Open(folder.Get(), below, kFileFlags | O_NOATIME, may_ask_kernel);
  if (fd < 0 && errno == EPERM) fd = Open(folder.Get(), below, kFileFlags, may_ask_kernel);
  return UniqueFd(fd);
}

}  // namespace base
