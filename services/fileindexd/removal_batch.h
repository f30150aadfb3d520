#pragma once

#include <string>
#include <utility>
#include <vector>

#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// Collects paths whose documents are to be removed, and removes 500 at once by a task of the group, since each request
/// to the index costs a round trip. Belongs to one thread. What is not flushed is not removed.
class RemovalBatch {
 public:
  RemovalBatch(TaskGroup& tasks, DocumentWriter& writer, bool and_below)
      : tasks_(tasks), writer_(writer), and_below_(and_below) {}

  /// The document at `path`, and, with `and_below`, all below it.
  void Add(const std::string& path) {
    paths_.push_back(path);
    if (paths_.size() >= kAtOnce) Flush();
  }
  void Flush() {
    if (paths_.empty()) return;
    tasks_.Submit([&writer = writer_, paths = std::exchange(paths_, {}), and_below = and_below_] {
      writer.Remove(paths, and_below);
    });
  }

 private:
  static constexpr size_t kAtOnce = 500;

  TaskGroup& tasks_;
  DocumentWriter& writer_;
  const bool and_below_;
  std::vector<std::string> paths_;
};

}  // namespace ferrox::indexd
