#include "services/fileindexd/access_batch.h"

#include <set>
#include <utility>

namespace ferrox::indexd {

void AccessBatch::Flush() {
  RefreshLeft();
  if (paths_.empty()) return;
  tasks_.Submit([&writer = writer_, paths = std::exchange(paths_, {}), left = left_] {
    const std::set<std::string> rest = writer.RecordAccess(paths);
    const base::MutexLock lock(left->mutex);
    left->paths.insert(left->paths.end(), rest.begin(), rest.end());
  });
}

void AccessBatch::RefreshLeft() {
  std::vector<std::string> paths;
  {
    const base::MutexLock lock(left_->mutex);
    paths.swap(left_->paths);
  }
  for (const std::string& path : paths) {
    tasks_.Submit([&writer = writer_, path] { writer.RefreshAttributes(path); });
  }
}

void AccessBatch::Finish() {
  Flush();
  tasks_.Wait();
  RefreshLeft();
  tasks_.Wait();
}

}  // namespace ferrox::indexd
