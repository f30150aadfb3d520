#include "platform/host/service_log.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "base/files.h"
#include "base/unique_fd.h"

namespace kova::host {

namespace {

constexpr off_t kLogMaxBytes = 16 << 20;

bool CopyAll(int from, int to) {
  char buffer[65536];
  for (;;) {
    const ssize_t got = read(from, buffer, sizeof(buffer));
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return got == 0;
    if (!base::WriteAll(to, {buffer, static_cast<size_t>(got)})) return false;
  }
}

}  // namespace

void BoundLog(const std::string& path) {
  const base::UniqueFd log(open(path.c_str(), O_RDWR | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
  struct stat info = {};
  if (!log.Valid() || fstat(log.Get(), &info) != 0 || !S_ISREG(info.st_mode) || info.st_size <= kLogMaxBytes) return;
  const std::string old_path = path + ".1";
  const base::UniqueFd old(open(old_path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0640));
  if (!old.Valid()) return;
  if (CopyAll(log.Get(), old.Get())) {
    (void)!ftruncate(log.Get(), 0);
  } else {
    (void)unlink(old_path.c_str());  // the disk is full: half a copy would only make it fuller
  }
}

}  // namespace kova::host
