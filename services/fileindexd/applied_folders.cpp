#include "services/fileindexd/applied_folders.h"

#include <syslog.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"

namespace ferrox::indexd {

namespace {

constexpr char kMountPoint[] = "mount_point";

}  // namespace

AppliedFolders::AppliedFolders(const std::string& path) : path_(path) {
  Json::Value stored;
  if (!fromFile(stored, path_)) return;
  try {
    GetJsonValue(mount_point_, stored, kMountPoint, false);
    stored.removeMember(kMountPoint);
    folders_ = ShareFolders::FromJson(stored);
  } catch (const Error&) {
    Log(LOG_WARNING, "%s is damaged; the folders of its share are compared with the index", path_.c_str());
  }
}

void AppliedFolders::Set(const ShareFolders& folders, const std::string& mount_point) {
  const bool same = folders.DifferingFrom(folders_).empty() && mount_point == mount_point_;
  folders_ = folders;
  mount_point_ = mount_point;
  if (same) return;
  Json::Value stored = folders.ToJson();
  if (!mount_point.empty()) stored[kMountPoint] = mount_point;
  if (!toFile(stored, path_)) Log(LOG_ERR, "cannot write %s: %s", path_.c_str(), ErrnoText().c_str());
}

void AppliedFolders::Forget() {
  folders_ = ShareFolders();
  mount_point_.clear();
  (void)Unlink(path_);
}

}  // namespace ferrox::indexd
