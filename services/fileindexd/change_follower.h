#pragma once

#include <chrono>
#include <set>
#include <string>

#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/queue_tail.h"
#include "services/fileindexd/repeating_thread.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// Early writes: while a long pass works on the detached queue, a thread of this class reads the live queue and writes
/// the files that it calls new or changed, so that they are found soon, however slow the pass's own files are to read.
/// It only writes documents and takes nothing from the queue: the pass that gets those lines carries them out again and
/// decides, so it does not matter which folders and places the present pass knew of these files.
class ChangeFollower {
 public:
  struct Context {
    const std::string& share;
    const std::string& root;  ///< the share's folder
    const ShareFolders& folders;
    services::Exclusions& exclusions;
    const std::string& queue_path;
    DocumentWriter& writer;
    TaskPool& pool;
    const Interruption& interruption;
    std::chrono::milliseconds interval;  ///< from one read of the queue to the next, at least
  };

  /// All that `context` refers to outlives the follower. Does nothing before Start.
  explicit ChangeFollower(const Context& context);

  void Start();
  /// Blocks until the writes that have begun are done. May be called again, and without a Start.
  void Stop() { thread_.Stop(); }
  /// @throws what ended the follower's thread: then a write, its own or one that it committed, may be missing.
  void ThrowIfFailed() { thread_.ThrowIfFailed(); }
  /// The files that it wrote. Only after Stop.
  const std::set<std::string>& EarlyWrites() const { return early_writes_; }

 private:
  void WriteChangedFiles();

  const Context context_;
  PathRules rules_;
  TaskGroup tasks_;
  QueueTail tail_;
  std::set<std::string> early_writes_;  ///< the thread's, until it has ended
  RepeatingThread thread_;
};

}  // namespace ferrox::indexd
