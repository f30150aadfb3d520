#include "services/fileindexd/file_count.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <utility>
#include <vector>

#include "base/files.h"
#include "services/fileindexd/path_rules.h"

namespace ferrox::indexd {

namespace {

base::OpenFolderPtr OpenFolder(const std::string& path, dev_t& device) {
  const int fd = open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  struct stat status = {};
  if (fd < 0 || fstat(fd, &status) != 0) {
    if (fd >= 0) (void)close(fd);
    return nullptr;
  }
  device = status.st_dev;
  return base::OpenFolderPtr(fdopendir(fd));
}

}  // namespace

FileCount::FileCount(const std::string& folder, const ShareFolders& folders, services::Exclusions& exclusions,
                     ShareStatus& status)
    : folders_(folders), exclusions_(exclusions), status_(status), thread_([this, folder] { Count(folder); }) {}

FileCount::~FileCount() {
  stop_.Request();
  thread_.join();
}

void FileCount::Count(const std::string& folder) {
  std::vector<std::string> waiting = {folder};
  uint64_t files = 0;
  dev_t root_device = 0;
  for (bool first = true; !waiting.empty(); first = false) {
    const std::string path = std::move(waiting.back());
    waiting.pop_back();
    dev_t device = 0;
    const base::OpenFolderPtr dir = OpenFolder(path, device);
    if (!dir) continue;
    if (first) root_device = device;
    if (device != root_device || folders_.IsInInner(path)) continue;
    const bool indexed = folders_.PlaceOf(path) == ShareFolders::Place::kIndexed;
    const auto exclusions = exclusions_.In(path);
    while (const dirent* entry = readdir(dir.get())) {
      const std::string name = entry->d_name;
      if (name == "." || name == ".." || entry->d_type == DT_LNK || PathRules::SkipName(name)) continue;
      const bool is_folder = entry->d_type == DT_DIR;
      const bool left_out = exclusions->Of(name, is_folder) == services::Exclusion::kLeftOut;
      if (left_out && !(is_folder && exclusions_.Of(path + "/" + name, true) == services::Exclusion::kNone)) continue;
      const auto place = indexed ? ShareFolders::Place::kIndexed : folders_.PlaceOf(path + "/" + name);
      if (place == ShareFolders::Place::kIndexed) ++files;
      if (place != ShareFolders::Place::kOutside && entry->d_type == DT_DIR) waiting.push_back(path + "/" + name);
    }
    if (stop_.Requested()) return;
    status_.SetEstimate(files, false);
  }
  status_.SetEstimate(files, true);
}

}  // namespace ferrox::indexd
