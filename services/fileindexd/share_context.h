#pragma once

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "services/fileindexd/applied_folders.h"
#include "services/fileindexd/current_folders.h"
#include "services/fileindexd/file_watch.h"
#include "services/fileindexd/interruption.h"
#include "services/fileindexd/pause_state.h"
#include "services/fileindexd/queue_progress.h"
#include "services/fileindexd/share_index.h"
#include "services/fileindexd/share_note.h"
#include "services/fileindexd/share_place.h"
#include "services/fileindexd/share_queue.h"
#include "services/fileindexd/share_status.h"
#include "services/fileindexd/task_pool.h"

namespace ferrox::indexd {

/// What every share's worker is given. `pool` and `pause` outlive the workers.
struct WorkerEnvironment {
  TaskPool& pool;
  const PauseState& pause;
  /// The index of a share.
  std::function<std::unique_ptr<ShareIndex>(const std::string& share)> open_index = &EngineShareIndex;
  /// From the end of a pass to the beginning of the next, at least: changes seldom come alone.
  std::chrono::milliseconds gather_time{100};
  /// The interval at which a pass under way reads the live queue for early writes (change_follower.h).
  std::chrono::milliseconds early_write_interval{200};
  /// While a management operation goes on, an index may be missing or paused for a moment, or the event of a rename be
  /// missing. What takes longer than this was not finished, and the worker puts it right.
  std::chrono::milliseconds patience = std::chrono::seconds(5);
  /// What is left out of all folders.
  CurrentFolders::InstancePatterns instance_patterns = [] { return ShareFolders::InstancePatterns(); };
  IsMountPoint is_mount_point = &NothingMounted;
  MountsBelow mounts_below = &NoMounts;
  /// What the engine is told of a share.
  DescribeShare describe_share = [](const std::string&) { return std::nullopt; };
  /// The interval at which the worker checks whether a volume that is away is back.
  std::chrono::milliseconds volume_poll = std::chrono::seconds(2);
};

/// What the parts of one share's worker use together. The worker makes it first, so that it outlives the parts. Only
/// `applied` belongs to one thread, the worker's; all else is safe from any.
struct ShareContext {
  /// @throws Error kNoSuchShare; kInternal.
  ShareContext(const std::string& share_name, const WorkerEnvironment& worker_environment);

  const std::string share;
  const std::string root;  ///< the share's folder when the worker was made
  const WorkerEnvironment environment;
  const ShareQueue queue;
  CurrentFolders folders;
  AppliedFolders applied;
  ShareStatus status;
  QueueProgress syncs;
  FileWatch watch;  ///< of the live queue; a Wake ends the worker's waits
  Interruption interruption;
  std::atomic<bool> stopping{false};  ///< the worker is to end, for good
};

}  // namespace ferrox::indexd
