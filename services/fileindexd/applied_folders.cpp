#include "services/fileindexd/applied_folders.h"

#include <syslog.h>

#include "common/error.h"
#include "common/file_util.h"
#include "common/json_util.h"
#include "common/log.h"

namespace ferrox::indexd {

AppliedFolders::AppliedFolders(const std::string& path) : path_(path) {
  Json::Value stored;
  if (!fromFile(stored, path_)) return;
  try {
    folders_ = ShareFolders::FromJson(stored);
  } catch (const Error&) {
    Log(LOG_WARNING, "%s is damaged; the folders of its share are compared with the index", path_.c_str());
  }
}

void AppliedFolders::Set(const ShareFolders& folders) {
  const bool same = folders.DifferingFrom(folders_).empty();
  folders_ = folders;
  if (!same && !toFile(folders.ToJson(), path_))
    Log(LOG_ERR, "cannot write %s: %s", path_.c_str(), ErrnoText().c_str());
}

void AppliedFolders::Forget() {
  folders_ = ShareFolders();
  (void)Unlink(path_);
}

}  // namespace ferrox::indexd
