#include "services/support/instance_owner.h"

#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <string>

#include <kova/instance.h>

#include "base/files.h"
#include "base/path.h"
#include "common/file_util.h"
#include "common/log.h"
#include "common/paths.h"

namespace ferrox::services {

namespace {

/// The table of shares and the settings; the lists of folders; what the notification daemon is to watch.
constexpr const char* kPrivateFolders[] = {"/etc/kova", kConfigurationFolder, "/var/lib/kova/notifyd"};

/// What stands above it others may enter: programs of other users' have their folders there, too.
bool MakePrivate(const std::string& folder) {
  if (!base::MakeFolders(base::FolderOf(folder))) return false;
  if (mkdir(folder.c_str(), 0700) == 0) return true;
  struct stat status = {};
  if (errno != EEXIST || stat(folder.c_str(), &status) != 0) return false;
  return !S_ISDIR(status.st_mode) || (status.st_mode & 077) == 0 || chmod(folder.c_str(), 0700) == 0;
}

}  // namespace

std::optional<uid_t> InstanceOwner() {
  const std::string& root = kova::InstanceRoot();
  struct stat status = {};
  if (stat(root.empty() ? "/" : root.c_str(), &status) != 0) return {};
  return status.st_uid;
}

bool IsRootsInstance() { return InstanceOwner().value_or(geteuid()) == 0; }

void ClosePrivateFolders() {
  if (geteuid() != 0 || !IsRootsInstance()) return;
  for (const char* folder : kPrivateFolders) {
    const std::string path = InstancePath(folder);
    if (!MakePrivate(path)) {
      Log(LOG_WARNING, "others may see what is in the folder %s, and it cannot be closed to them: %s", path.c_str(),
          ErrnoText().c_str());
    }
  }
}

}  // namespace ferrox::services
