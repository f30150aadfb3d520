#include "services/support/own_account.h"

#include <fcntl.h>
#include <grp.h>
#include <pwd.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <climits>

#include "base/unique_fd.h"
#include "common/error.h"
#include "common/log.h"
#include "common/paths.h"

namespace ferrox::services {

EngineIds IdsOfAccount(const std::string& user, const char* daemon) {
  EngineIds ids;
  const char* end = user.data() + user.size();
  const passwd* account = getpwnam(user.c_str());
  if (account != nullptr) {
    ids = {account->pw_uid, account->pw_gid};
  } else if (const auto read = std::from_chars(user.data(), end, ids.uid); read.ec == std::errc() && read.ptr == end) {
    account = getpwuid(ids.uid);
    ids.gid = account != nullptr ? account->pw_gid : ids.uid;
  }
  const bool usable = ids.uid != 0 && ids.gid != 0 && ids.uid != UINT_MAX;
  FERROX_FAIL_IF(!usable, Error::kInternal, "\"" + user + "\" is no account that " + daemon + " can have");
  return ids;
}

bool GivePidFile(const char* daemon, const EngineIds& to) {
  const std::string path = InstancePath("/var/run/") + daemon + ".pid";
  const base::UniqueFd file(open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC, 0600));
  struct stat status = {};
  return file.Valid() && fstat(file.Get(), &status) == 0 && S_ISREG(status.st_mode) && status.st_nlink == 1 &&
         fchown(file.Get(), to.uid, to.gid) == 0 && fchmod(file.Get(), 0600) == 0;
}

bool GiveOwnFolder(const std::string& path, mode_t mode, const EngineIds& to) {
  if (mkdir(path.c_str(), mode) != 0 && errno != EEXIST) return false;
  const base::UniqueFd folder(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  return folder.Valid() && fchown(folder.Get(), to.uid, to.gid) == 0 && fchmod(folder.Get(), mode) == 0;
}

void BecomeUser(const EngineIds& ids) {
  const bool became = setgroups(0, nullptr) == 0 && setresgid(ids.gid, ids.gid, ids.gid) == 0 &&
                      setresuid(ids.uid, ids.uid, ids.uid) == 0 && setresuid(0, 0, 0) != 0;
  FERROX_FAIL_IF(!became, Error::kInternal, "cannot become user " + std::to_string(ids.uid));
  (void)prctl(PR_SET_DUMPABLE, 1);  // its files below /proc are its own, as if that user had started it
}

}  // namespace ferrox::services
