#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "services/kovanotifyd/queues/queue_router.h"
#include "services/kovanotifyd/registry.h"
#include "services/kovanotifyd/roots/watch_set.h"

namespace ferrox::notifyd {

/// What people can see of one registration.
struct QueueStatus {
  /// One of its folders.
  struct Watch {
    std::string path;  ///< as registered
    WatchState state;
  };

  std::string queue;  ///< the full path of its file
  std::string application;
  std::vector<Watch> watches;
  QueueFigures figures;  ///< of the queue, which may be shared by several applications
};

/// What people can see of the daemon.
struct NotifierStatus {
  std::vector<QueueStatus> queues = {};
  uint64_t changes = 0;                    ///< reported by the watchers since the start
  uint64_t lost = 0;                       ///< how many times the kernel dropped some, since the start
  std::vector<std::string> problems = {};  ///< sentences: unusable settings and registrations, folders not watched
};

/// Of each registration, in the registry's order.
std::vector<QueueStatus> QueueStatusOf(const Registry& registry, const WatchSet& watches, const QueueRouter& router);

}  // namespace ferrox::notifyd
