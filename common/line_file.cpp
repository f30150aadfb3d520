#include "common/line_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>

#include "base/unique_fd.h"
#include "common/log.h"

namespace ferrox {

namespace {

/// Whether the file's last line lacks its end: a writer died in it, and the next line must not be glued to it.
bool EndsInHalfLine(int fd, off_t size) {
  char last = '\n';
  return size > 0 && pread(fd, &last, 1, size - 1) == 1 && last != '\n';
}

/// Takes back what a failed write left, unless somebody else has written behind it.
void TakeBack(int fd, off_t size_before, ssize_t written) {
  struct stat now = {};
  if (written <= 0 || fstat(fd, &now) != 0 || now.st_size != size_before + written) return;
  if (ftruncate(fd, size_before) != 0) Log(LOG_ERR, "cannot take back half a line: %m");
}

}  // namespace

bool AppendLines(const std::string& path, std::string_view lines) {
  const base::UniqueFd file(open(path.c_str(), O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC | O_NOFOLLOW, 0644));
  struct stat before = {};
  if (!file.Valid() || fstat(file.Get(), &before) != 0) return false;
  char newline = '\n';
  const size_t missing = EndsInHalfLine(file.Get(), before.st_size) ? 1 : 0;
  const iovec parts[] = {{&newline, missing}, {const_cast<char*>(lines.data()), lines.size()}};
  errno = 0;
  const ssize_t written = writev(file.Get(), parts, 2);
  if (written == static_cast<ssize_t>(missing + lines.size())) return true;
  const int write_errno = errno != 0 ? errno : ENOSPC;
  TakeBack(file.Get(), before.st_size, written);
  errno = write_errno;
  return false;
}

}  // namespace ferrox
