#pragma once

#include <chrono>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <set>
#include <string>
#include <thread>

#include "services/fileindexd/document_writer.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/path_rules.h"
#include "services/fileindexd/queue_tail.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// While a long pass goes on, writes files that the live queue calls changed, so that they are found soon, however slow
/// the pass's own files are to read. Only that: their lines stay in the queue, whose pass carries them out again in its
/// turn and decides, so that it does not matter what the present pass knew of these files.
class ChangeFollower {
 public:
  struct Context {
    const std::string& share;
    const std::string& root;
    const ShareFolders& folders;
    const std::string& queue_path;
    DocumentWriter& writer;
    TaskPool& pool;
    const Interruption& interruption;
    std::chrono::milliseconds interval;  ///< from one look at the queue to the next, at least
  };

  /// All in `context` outlives it. Begins with Start.
  explicit ChangeFollower(const Context& context);
  ChangeFollower(const ChangeFollower&) = delete;
  ChangeFollower& operator=(const ChangeFollower&) = delete;
  /// Like Stop.
  ~ChangeFollower() { Stop(); }

  void Start();
  /// Returns when what has begun is done.
  void Stop();
  /// @throws what ended its work: then what it wrote, or others beside it, may not be in the index.
  void Check();
  /// The files that it wrote. Once it is stopped.
  const std::set<std::string>& Written() const { return written_; }

 private:
  void Follow();
  bool WaitForNextLook(std::chrono::steady_clock::duration last_took);
  void WriteChangedFiles();

  const Context context_;
  PathRules rules_;
  TaskGroup tasks_;
  QueueTail tail_;
  std::set<std::string> written_;
  std::mutex mutex_;
  std::condition_variable stop_changed_;
  bool stopping_ = false;
  std::exception_ptr failure_;
  std::thread thread_;
};

}  // namespace ferrox::indexd
