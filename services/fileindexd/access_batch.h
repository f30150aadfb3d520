#pragma once

#include <memory>
#include <string>
#include <vector>

#include "base/mutex.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// Collects files and folders whose attributes changed, and has the rights of 1,000 at once recorded by a task of the
/// group. What turns out to need more than that is refreshed by tasks of its own. Belongs to one thread.
class AccessBatch {
 public:
  /// Both outlive it; `tasks` may end its tasks afterwards, which do not use this object.
  AccessBatch(TaskGroup& tasks, DocumentWriter& writer) : tasks_(tasks), writer_(writer) {}

  void Add(const std::string& path) {
    paths_.push_back(path);
    if (paths_.size() >= kAtOnce) Flush();
  }
  /// Returns when all that was added is recorded, and all other tasks of the group are done. @throws Interrupted;
  /// Error.
  void Finish();

 private:
  static constexpr size_t kAtOnce = 1000;

  /// What tasks leave to be refreshed.
  struct Left {
    base::Mutex mutex;
    std::vector<std::string> paths BASE_GUARDED_BY(mutex);
  };

  void Flush();
  void RefreshLeft();

  TaskGroup& tasks_;
  DocumentWriter& writer_;
  std::vector<std::string> paths_;
  std::shared_ptr<Left> left_ = std::make_shared<Left>();
};

}  // namespace ferrox::indexd
