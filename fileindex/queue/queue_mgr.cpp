#include "fileindex/queue/queue_mgr.h"

#include <cerrno>
#include <cstdio>

#include "base/path.h"
#include "common/file_util.h"
#include "common/lock_file.h"
#include "common/log.h"
#include "common/new_class.h"
#include "fileindex/folders/folder_mgr.h"
#include "fileindex/optree/optree.h"
#include "fileindex/queue/event_line_reader.h"
#include "fileindex/queue/queue_file.h"

namespace ferrox::fileindex {

namespace {

/// Deliberate: "/" covers itself alone. No queue is the root's, and who asks for it is not stopped by every event.
bool Covers(std::string_view folder, std::string_view path) {
  return path == folder || (folder != "/" && base::IsAtOrBelow(path, folder));
}

}  // namespace

QueueMgr::QueueMgr(const std::string& queue_path)
    : queue_path_(queue_path), queue_path_tmp_(DetachedQueuePath(queue_path)) {}

void QueueMgr::DeleteTmp() {
  (void)Unlink(queue_path_tmp_);
  op_tree_tmp_.reset();
}

/// Whether there is a detached queue is asked under the lock: two that detach at the same time would otherwise both see
/// none, and the second's rename would replace the queue of the first. The lock goes with its file to the new name;
/// writers that wait for it then see that it is no longer at the live queue's path, and make a new one.
bool QueueMgr::PrepareTmpQueue() {
  if (!IsFileExist(queue_path_)) return IsFileExist(queue_path_tmp_);
  const LockFile lock(queue_path_, true);
  if (IsFileExist(queue_path_tmp_)) return true;
  FERROX_FAIL_IF(0 > rename(queue_path_.c_str(), queue_path_tmp_.c_str()), Error::kInternal,
                 "rename failed, reason=" + ErrnoText());
  op_tree_tmp_.reset();
  return true;
}

// Trees are kept: a queue of a million lines takes a second to fold, and callers ask more than once. The live queue's
// is that of the moment at which it was first asked for.
std::shared_ptr<OPTree> QueueMgr::GetOPTree() const {
  if (op_tree_ == nullptr) op_tree_ = newClass<OPTree>(queue_path_);
  return op_tree_;
}

std::shared_ptr<OPTree> QueueMgr::GetOPTreeTmp() const {
  if (op_tree_tmp_ == nullptr) op_tree_tmp_ = newClass<OPTree>(queue_path_tmp_);
  return op_tree_tmp_;
}

int QueueMgr::ProcessOP(const std::function<void(std::shared_ptr<OP>)>& fn, bool use_tmp) {
  if (use_tmp) return PrepareTmpQueue() ? GetOPTreeTmp()->ProcessOP(fn) : 0;
  return IsFileExist(queue_path_) ? GetOPTree()->ProcessOP(fn) : 0;
}

bool QueueMgr::IsFullPathProcessing(const std::string& full_path) {
  // Folders that cannot be loaded count as a failure here; otherwise they have no say.
  const FolderMgr folder_mgr;
  const auto touches = [&full_path](const std::shared_ptr<Event>& event) {
    return Covers(full_path, event->path) || Covers(full_path, event->path_old);
  };
  return FindQueues(touches);
}

bool QueueMgr::IsFullPathHasReindex(const std::string& full_path) {
  const auto covers = [&full_path](const std::shared_ptr<Event>& event) {
    return event->event == EVENT_REINDEX && Covers(event->path, full_path);
  };
  return FindQueues(covers);
}

/// The live queue first: what is detached in between is then found in the detached one. In the other order an event
/// could pass from one to the other unseen.
bool QueueMgr::FindQueues(const std::function<bool(std::shared_ptr<Event>)>& pred) const {
  return FindQueue(pred, queue_path_) || FindQueue(pred, queue_path_tmp_);
}

/// Whether `pred` accepts a line of the file; ends with the first. Nothing is folded: an event counts also where a
/// later one makes it void. A bad line ends the search by its error, since what it would have said is not known.
bool QueueMgr::FindQueue(const std::function<bool(std::shared_ptr<Event>)>& pred, const std::string& path) {
  if (!IsFileExist(path)) return false;
  EventLineReader reader(path);
  // Detached or deleted since: as missing as before.
  if (!reader.Valid() && errno == ENOENT) return false;
  FERROX_FAIL_IF_AS(!reader.Valid(), "!input_stream", Error::kInternal, "Failed to open queue, reason=" + ErrnoText());
  std::string_view line;
  while (reader.Next(line)) {
    if (pred(newClass<Event>(std::string(line)))) return true;
  }
  return false;
}

}  // namespace ferrox::fileindex
