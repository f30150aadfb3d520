#include "services/kovanotifyd/cookie.h"

#include <fcntl.h>
#include <sys/stat.h>

#include "base/files.h"
#include "common/file_util.h"
#include "common/log.h"

namespace ferrox::notifyd {

/// Opened for reading: closing a file that was open for writing would be reported as a change.
Cookie::Cookie(const std::string& path) : path_(path) {
  (void)base::MakeFolders(Dirname(path));
  file_.Reset(open(path.c_str(), O_RDONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK, 0600));
  FERROX_FAIL_IF(!file_.Valid(), Error::kInternal, "cannot make " + path + ": " + ErrnoText());
}

bool Cookie::Touch() const { return futimens(file_.Get(), nullptr) == 0; }

}  // namespace ferrox::notifyd
