#pragma once

#include <functional>
#include <memory>
#include <string>

#include "common/export.h"

namespace ferrox::fileindex {

struct Event;
struct OP;
class OPTree;
class QueueScan;

/// One share's event queue file and its processing copy. Writers append to the live queue; a reader detaches it by a
/// rename to its ".tmp" name, works through that, and deletes it. At most one detached queue exists at a time. Missing
/// queue files count as empty. One object is not for several threads at once: trees are kept in const members.
/// Work through a queue goes like this. A process that is killed in the middle finds the detached queue at its next
/// start, and begins that anew:
///   QueueMgr queue(share.GetQueuePath());
///   queue.ProcessOP(carry_out, true);
///   queue.DeleteTmp();
class FERROX_EXPORT QueueMgr {
 public:
  /// For the queue at `queue_path`, a full path. Opens nothing yet.
  explicit QueueMgr(const std::string& queue_path);

  /// Removes the detached queue; a missing one is no error.
  void DeleteTmp();

  /// Detaches the live queue for processing by renaming it to its ".tmp" name. Does nothing when there is no live queue
  /// or while an earlier detached queue still waits. The queue's lock keeps the custom-event writer out meanwhile.
  /// Blocks while the lock is taken elsewhere: 64 attempts, at most about 58 s.
  /// @return whether a detached queue is there to process.
  /// @throws Error kLockFailed when the lock cannot be had; kInternal when the rename fails (the queue is then as
  /// before).
  bool PrepareTmpQueue();

  /// The tree of the live and of the detached queue, built when first asked for and kept.
  /// @throws Error kInternal when the file cannot be opened.
  std::shared_ptr<OPTree> GetOPTree() const;
  std::shared_ptr<OPTree> GetOPTreeTmp() const;

  /// Hands the operations of a queue to `fn` (OPTree::ProcessOP): of the detached queue, detaching it first, or of the
  /// live queue in place. Deletes nothing: call DeleteTmp once every operation has been carried out.
  /// @return the tree's count, 0 when there is no queue. @throws Error as PrepareTmpQueue and OPTree do.
  int ProcessOP(const std::function<void(std::shared_ptr<OP>)>& fn, bool use_tmp);

  /// Whether either queue holds an event that touches `full_path` or anything below it. Reads without the lock.
  /// @throws Error kInternal when a queue cannot be opened; kMalformedEvent or kBadArgument at a bad line; as FolderMgr
  /// does when the folders cannot be loaded.
  bool IsFullPathProcessing(const std::string& full_path);
  /// Whether either queue holds a pure reindex event that covers `full_path`. Throws as above for the queue.
  bool IsFullPathHasReindex(const std::string& full_path);

 private:
  friend class QueuedReindexes;
  friend class QueueScan;

  static bool FindQueue(const std::function<bool(std::shared_ptr<Event>)>& pred, const std::string& path);
  bool FindQueues(const std::function<bool(std::shared_ptr<Event>)>& pred) const;

  std::string queue_path_;
  std::string queue_path_tmp_;
  mutable std::shared_ptr<OPTree> op_tree_;  ///< null until it is asked for, like the next
  mutable std::shared_ptr<OPTree> op_tree_tmp_;
};

}  // namespace ferrox::fileindex
