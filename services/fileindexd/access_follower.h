#pragma once

#include <chrono>
#include <set>
#include <string>

#include "services/fileindexd/anchors.h"
#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/queue_tail.h"
#include "services/fileindexd/repeating_thread.h"
#include "services/fileindexd/share_index.h"
#include "services/support/exclusions.h"

namespace ferrox::indexd {

/// Rights overtake content: while a pass works on the detached queue, a thread of this class reads the live queue, and
/// records and commits the rights of all files and folders that it says changed, at once, however many files wait to be
/// read. Rights belong to the inode, so a file with several names has them recorded under each. Takes nothing from the
/// queue: the pass that gets those lines carries them out again, and does what takes more than that.
class AccessFollower {
 public:
  struct Context {
    const std::string& root;  ///< the share's folder
    const std::string& queue_path;
    services::Exclusions& exclusions;
    ShareIndex& index;
    DocumentWriter& writer;
    Anchors& anchors;
    const Interruption& interruption;
    std::chrono::milliseconds interval;  ///< from one read of the queue to the next, at least
  };

  /// All that `context` refers to outlives the follower. Does nothing before Start.
  explicit AccessFollower(const Context& context)
      : context_(context),
        tail_(context.queue_path),
        thread_(context.interruption, context.interval, kFirstIntervals * context.interval) {}

  void Start();
  /// May be called again, and without a Start.
  void Stop() { thread_.Stop(); }
  /// @throws what ended the follower's thread: then what it committed may be missing.
  void ThrowIfFailed() { thread_.ThrowIfFailed(); }

 private:
  void RecordChanges();
  std::set<std::string> PathsOf(const AttributeChanges& changes);

  /// Most passes end before that, and the next one does the same work.
  static constexpr int kFirstIntervals = 2;

  const Context context_;
  QueueTail tail_;
  RepeatingThread thread_;
};

}  // namespace ferrox::indexd
