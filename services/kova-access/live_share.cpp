#include "services/kova-access/live_share.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>

#include <kova/content_extract.h>

#include "base/path.h"
#include "common/error.h"
#include "common/log.h"

namespace ferrox::access {

namespace {

constexpr int kReadFlags = O_RDONLY | O_NOCTTY | O_CLOEXEC;

/// What lies at the path `below` the folder `root`, without opening it: only the ways to it are checked.
base::UniqueFd FindBelow(int root, const char* below) {
  open_how how = {};
  how.flags = O_PATH | O_CLOEXEC;
  how.resolve = RESOLVE_BENEATH | RESOLVE_NO_SYMLINKS | RESOLVE_NO_MAGICLINKS | RESOLVE_NO_XDEV;
  base::UniqueFd found(static_cast<int>(syscall(SYS_openat2, root, below, &how, sizeof(how))));
  FERROX_FAIL_IF(!found.Valid() && errno == ENOSYS, Error::kEngineRightsUnknown,
                 "kova-access needs Linux 5.6 or a later one");
  return found;
}

/// The part of a path below the share's folder; "" when it does not lie there, or is not in its plain form.
std::string PathBelow(const std::string& path, const std::string& root) {
  if (!base::IsBelow(path, root)) return "";
  const std::string below = path.substr(root == "/" ? 1 : root.size() + 1);
  return ("/" + below + "/").find("/../") == std::string::npos ? below : "";
}

}  // namespace

OwnDescriptors::OwnDescriptors() : folder_(open("/proc/self/fd", O_PATH | O_DIRECTORY | O_CLOEXEC)) {
  FERROX_FAIL_IF(!folder_.Valid(), Error::kInternal, "cannot open /proc/self/fd: " + ErrnoText());
}

base::UniqueFd OwnDescriptors::Reopen(int path_fd, int flags) const {
  return base::UniqueFd(openat(folder_.Get(), std::to_string(path_fd).c_str(), flags));
}

LiveShare::LiveShare(const OwnDescriptors& own_descriptors, const std::string& root)
    : own_descriptors_(own_descriptors),
      root_path_(root),
      root_(open(root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC)) {}

/// Finding "." in the folder asks for the right to go into it.
wire::LiveFile LiveShare::LookAtRoot() const {
  wire::LiveFile file;
  struct stat status = {};
  if (!root_.Valid() || fstat(root_.Get(), &status) != 0) return file;
  file.entered = FindBelow(root_.Get(), ".").Valid();
  file.readable = own_descriptors_.Reopen(root_.Get(), kReadFlags).Valid();
  file.folder = true;
  if (file.entered || file.readable) file.stamp = KOVA::CONTENT_EXTRACT::Stamp(status);
  return file;
}

/// A regular file or folder. The descriptor stays with it, whatever is put in its place meanwhile.
base::UniqueFd LiveShare::Find(const std::string& path, struct stat& status) const {
  const std::string below = PathBelow(path, root_path_);
  if (!root_.Valid() || below.empty()) return {};
  base::UniqueFd found = FindBelow(root_.Get(), below.c_str());
  const bool usable = found.Valid() && fstat(found.Get(), &status) == 0;
  if (!usable || (!S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode))) found.Reset();
  return found;
}

/// The stamp is that of the moment at which it is open. EAGAIN says that the open was allowed, and that another process
/// holds a lease that has to be broken first (fcntl(2), F_SETLEASE).
wire::LiveFile LiveShare::Look(const std::string& path) const {
  if (path == root_path_) return LookAtRoot();
  wire::LiveFile file;
  struct stat status = {};
  const base::UniqueFd found = Find(path, status);
  if (!found.Valid()) return file;
  const base::UniqueFd opened = own_descriptors_.Reopen(found.Get(), kReadFlags | O_NONBLOCK);
  const bool is_leased = !opened.Valid() && errno == EAGAIN;
  if (!opened.Valid() && !is_leased) return file;
  if (fstat(is_leased ? found.Get() : opened.Get(), &status) != 0) return file;
  file.readable = true;
  file.folder = S_ISDIR(status.st_mode);
  file.stamp = KOVA::CONTENT_EXTRACT::Stamp(status);
  return file;
}

base::UniqueFd LiveShare::Open(const std::string& path) const {
  if (path == root_path_) return root_.Valid() ? own_descriptors_.Reopen(root_.Get(), kReadFlags) : base::UniqueFd();
  struct stat status = {};
  const base::UniqueFd found = Find(path, status);
  return found.Valid() ? own_descriptors_.Reopen(found.Get(), kReadFlags) : base::UniqueFd();
}

}  // namespace ferrox::access
